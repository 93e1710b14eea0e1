// What ./run does on a machine without a display, once everything is built.
#include "tests/platform/TemporaryDirectory.h"
#include "tests/support/Process.h"

#include <QImage>

#include <gmock/gmock.h>

namespace qivo {
namespace {

using testing::HasSubstr;

/// How much of a picture has that kind of colour.
template <typename Kind>
double share(const QImage& picture, Kind kind) {
    int count = 0;
    for (int y = 0; y < picture.height(); ++y) {
        for (int x = 0; x < picture.width(); ++x) {
            count += static_cast<int>(kind(QColor(picture.pixel(x, y))));
        }
    }
    return count / static_cast<double>(picture.width() * picture.height());
}

TEST(Demonstration, ChoosesASourceThroughTheMenuAndSavesAPictureOfIt) {
    const TemporaryDirectory folder;
    const auto script = test::Process::start({DEMONSTRATE, BUILD, folder.path()}, {"DISPLAY=", "WAYLAND_DISPLAY="});
    ASSERT_TRUE(script);
    EXPECT_EQ(script->wait(std::chrono::seconds(100)), 0) << script->errors();
    EXPECT_THAT(script->output(), HasSubstr("Chose 'STAGE (Wide)' in the Sources menu and saved a picture"));
    const QImage picture(QString::fromStdString(folder.path("run.png")));
    ASSERT_FALSE(picture.isNull());
    // The test picture's bars fill most of the window.
    EXPECT_GT(share(picture, [](const QColor& at) { return at.red() > 150 && at.blue() < 60; }), 0.05);
    EXPECT_GT(share(picture, [](const QColor& at) { return at.green() > 150 && at.red() < 60; }), 0.05);
    EXPECT_GT(share(picture, [](const QColor& at) { return at.blue() > 150 && at.green() < 60; }), 0.05);
    EXPECT_LT(share(picture, [](const QColor& at) { return at.value() < 16; }), 0.5);
}

} // namespace
} // namespace qivo
