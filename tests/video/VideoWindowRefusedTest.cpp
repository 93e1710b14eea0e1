// A display that has no OpenGL 4.1, or no OpenGL at all.

#include "tests/platform/LogCapture.h"
#include "tests/video/WindowFixture.h"

namespace qivo::test {
namespace {

class VideoWindowRefusedTest : public WindowFixture {};

TEST_F(VideoWindowRefusedTest, TheViewStaysBlackAndTheLogSaysWhyOnce) {
    LogCapture log;
    select();
    window->resize(640, 360);
    window->show();
    std::vector<std::string> records;
    ASSERT_TRUE(runUntil([&] {
        for (auto& record : log.take()) {
            records.push_back(record);
        }
        return !records.empty();
    }));
    const auto shown = [&] {
        const auto found = screen->findWindow(kTitle);
        return found ? screen->grab(*found) : Picture();
    };
    EXPECT_TRUE(runUntil([&] {
        const Picture shot = shown();
        return shot.width == 640 && colour(shot, 320, 180) == kBlack && colour(shot, 0, 0) == kBlack;
    }));
    window->resize(700, 400);
    EXPECT_TRUE(runUntil([&] {
        const Picture shot = shown();
        return shot.width == 700 && colour(shot, 690, 390) == kBlack;
    }));
    window->close();
    ASSERT_EQ(records.size(), 1U);
    EXPECT_EQ(records[0].rfind(">> ERROR: OpenGL 4.1 core " REASON, 0), 0U) << records[0];
    EXPECT_TRUE(log.take().empty());
    EXPECT_TRUE(FakeQivo::instance().calls().empty());
}

} // namespace
} // namespace qivo::test
