#include "platform/UrlOpener.h"

#include "tests/platform/LogCapture.h"

#include <gmock/gmock.h>

namespace qivo {
namespace {

TEST(UrlOpener, HandsTheAddressToTheReplacementAndReportsFailure) {
    LogCapture log;
    QUrl opened;
    bool answer = true;
    setUrlOpener([&](const QUrl& url) {
        opened = url;
        return answer;
    });
    EXPECT_TRUE(openUrl(QUrl("http://camera/page")));
    EXPECT_EQ(opened, QUrl("http://camera/page"));
    EXPECT_THAT(log.take(), testing::ElementsAre());
    answer = false;
    EXPECT_FALSE(openUrl(QUrl("http://camera/page")));
    EXPECT_THAT(log.take(), testing::ElementsAre("http://camera/page could not be opened in a browser"));
    setUrlOpener({});
}

} // namespace
} // namespace qivo
