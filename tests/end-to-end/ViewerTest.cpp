#include "tests/end-to-end/ViewerFixture.h"

#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <gmock/gmock.h>
#include <sstream>

namespace qivo::test {
namespace {

using std::chrono::seconds;
using testing::HasSubstr;

std::string settings() {
    std::ostringstream text;
    const std::filesystem::path folder = std::string(std::getenv("XDG_CONFIG_HOME"));
    for (const auto& entry : std::filesystem::recursive_directory_iterator(folder)) {
        if (entry.is_regular_file() && entry.path().extension() == ".conf") {
            text << std::ifstream(entry.path()).rdbuf();
        }
    }
    return text.str();
}

int countOf(const std::string& text, const std::string& part) {
    int count = 0;
    for (std::size_t at = text.find(part); at != std::string::npos; at = text.find(part, at + part.size())) {
        ++count;
    }
    return count;
}

/// How many columns it takes from the white to the black of the time code's first two cells: an edge of the full stream
/// is sharp, one of the low stream has been stretched.
int edgeWidth(const Picture& picture, const Box& box) {
    const int cell = box.width / 64;
    const int y = box.y + box.height - box.height / 36;
    const int white = picture.around(box.x + cell / 2, y).green;
    const int black = picture.around(box.x + cell + cell / 2, y).green;
    int width = 0;
    for (int x = box.x + cell / 2; x < box.x + cell + cell / 2; ++x) {
        const int level = picture.at(x, y).green;
        width += level < white - (white - black) / 6 && level > black + (white - black) / 6;
    }
    return width;
}

TEST_F(ViewerTest, ASourceChosenByKeyboardIsShown) {
    const auto publisher = publish("STUDIO", {"Cam 1", "Cam 2"});
    startViewer();
    choose(0, 0, "STUDIO (Cam 1)");
    ASSERT_TRUE(picturesArrive());
    const Picture picture = viewPicture();
    expectBars(picture, letterBox(picture.width, picture.height));
    EXPECT_THAT(m_viewer->output(), HasSubstr("selected a QIVO source \n"));
}

TEST_F(ViewerTest, ThePictureMovesOn) {
    const auto publisher = publish("STUDIO", {"Cam 1"});
    startViewer();
    choose(0, 0, "STUDIO (Cam 1)");
    ASSERT_TRUE(picturesArrive());
    for (int i = 0; i < 10; ++i) {
        const auto time = shownTime();
        ASSERT_TRUE(picturesArrive(time.value_or(now()))) << "after " << i << " pictures";
    }
}

TEST_F(ViewerTest, AnotherSourceReplacesThePicture) {
    const auto studio = publish("STUDIO", {"Cam 1"});
    const auto zoo = publish("ZOO", {"Owl"}, {"--size", "640x480"});
    startViewer();
    choose(0, 0, "STUDIO (Cam 1)");
    ASSERT_TRUE(picturesArrive());
    // The second source has another shape: the bars at its sides show that the picture is its own.
    choose(1, 0, "ZOO (Owl)");
    const auto pillars = [this] {
        const Picture picture = viewPicture();
        const Box box = letterBox(picture.width, picture.height, 4, 3);
        const auto beside = picture.around(box.x / 2, picture.height / 2);
        const auto inside = picture.around(box.x + box.width / 14, box.y + box.height / 8);
        return beside.red + beside.green + beside.blue == 0 && inside.red > 150;
    };
    ASSERT_TRUE(eventually(pillars));
    const Picture picture = viewPicture();
    expectBars(picture, letterBox(picture.width, picture.height, 4, 3));
}

TEST_F(ViewerTest, LowBandwidthShowsTheLowStreamAndBackAgain) {
    const auto publisher = publish("STUDIO", {"Cam 1"}, {"--size", "1280x720"});
    startViewer();
    choose(0, 0, "STUDIO (Cam 1)");
    // Large enough to tell the streams by their edges: shown once and a half and six times as wide as they are.
    ASSERT_TRUE(sizeView(1920, 1080));
    ASSERT_TRUE(picturesArrive());
    int width = 0;
    const auto edgeBecomes = [&](const testing::Matcher<int>& expected) {
        return eventually([&] {
            const Picture picture = viewPicture();
            width = edgeWidth(picture, letterBox(picture.width, picture.height));
            return expected.Matches(width);
        });
    };
    EXPECT_TRUE(edgeBecomes(testing::Le(2))) << width;
    pressSwitch("Control+l");
    EXPECT_TRUE(edgeBecomes(testing::Ge(3))) << width;
    EXPECT_TRUE(picturesArrive(now()));
    pressSwitch("Control+l");
    EXPECT_TRUE(edgeBecomes(testing::Le(2))) << width;
    EXPECT_TRUE(picturesArrive(now()));
}

TEST_F(ViewerTest, APublisherThatIsKilledAndStartedAgainIsShownAgain) {
    auto publisher = publish("STUDIO", {"Cam 1"});
    startViewer();
    choose(0, 0, "STUDIO (Cam 1)");
    ASSERT_TRUE(picturesArrive());
    publisher->signal(SIGKILL);
    publisher->wait(seconds(5));
    const auto last = viewPicture();
    EXPECT_GT(last.around(last.width / 14, last.height / 8).red, 150)
        << "the last picture stays while the source is gone";
    publisher = publish("STUDIO", {"Cam 1"});
    const std::int64_t returned = now();
    EXPECT_TRUE(picturesArrive(returned)) << m_viewer->errors();
    RecordProperty("msUntilPictureAgain", static_cast<int>(now() - returned));
}

TEST_F(ViewerTest, ThePictureIsLetterBoxedInEverySize) {
    const auto publisher = publish("STUDIO", {"Cam 1"});
    startViewer();
    choose(0, 0, "STUDIO (Cam 1)");
    ASSERT_TRUE(picturesArrive());
    for (const auto& [width, height] : {std::pair{1920, 1080}, {1000, 1000}, {1000, 400}}) {
        ASSERT_TRUE(sizeView(width, height));
        ASSERT_TRUE(picturesArrive(now())) << width << " x " << height;
        const Picture picture = viewPicture();
        const Box box = letterBox(width, height);
        expectBars(picture, box);
        for (const auto& [x, y] : {std::pair{box.x / 2, height / 2},
                                   {width - 1 - box.x / 2, height / 2},
                                   {width / 2, box.y / 2},
                                   {width / 2, height - 1 - box.y / 2}}) {
            const bool outside = x < box.x || y < box.y || x >= box.x + box.width || y >= box.y + box.height;
            const auto colour = picture.at(x, y);
            EXPECT_TRUE(!outside || colour.red + colour.green + colour.blue == 0) << x << ", " << y;
        }
        if (box.y > 0) { // the first and last rows of the picture stand where they belong
            EXPECT_EQ(picture.at(width / 14, box.y - 1).red, 0);
            EXPECT_GT(picture.at(width / 14, box.y + 1).red, 100);
        }
        if (box.x > 0) {
            EXPECT_EQ(picture.at(box.x - 1, height / 8).red, 0);
            EXPECT_GT(picture.at(box.x + 1, height / 8).red, 100);
        }
    }
}

TEST_F(ViewerTest, MenusAndShortcutsWorkAfterAClickOnThePicture) {
    const auto publisher = publish("STUDIO", {"Cam 1", "Cam 2"});
    startViewer();
    choose(0, 0, "STUDIO (Cam 1)");
    ASSERT_TRUE(picturesArrive());
    const Window inside = view();
    m_screen->click(inside.x + inside.width / 2, inside.y + inside.height / 2);
    choose(0, 1, "STUDIO (Cam 2)");
    m_screen->click(inside.x + inside.width / 2, inside.y + inside.height / 2);
    m_screen->key("F11");
    const Picture screen = m_screen->grabAll();
    EXPECT_TRUE(eventually([&] { return view().width == screen.width; })) << "F11 after a click on the picture";
    const Window full = view();
    m_screen->click(full.x + full.width / 2, full.y + full.height / 2);
    choose(0, 0, "STUDIO (Cam 1)");
    EXPECT_TRUE(picturesArrive(now()));
    m_screen->key("Escape");
    EXPECT_TRUE(eventually([&] { return view().width < screen.width; })) << "Escape in full screen";
}

TEST_F(ViewerTest, ASourceThatEndsLeavesTheMenu) {
    auto publisher = publish("STUDIO", {"Cam 1"});
    startViewer();
    choose(0, 0, "STUDIO (Cam 1)");
    ASSERT_TRUE(picturesArrive());
    publisher->signal(SIGINT);
    EXPECT_EQ(publisher->wait(seconds(5)), 0);
    std::this_thread::sleep_for(seconds(2)); // the time a goodbye may take to be shown
    // The first entry is the next source's now; had the old one stayed, it would be chosen again.
    const auto zoo = publish("ZOO", {"Owl"});
    choose(0, 0, "ZOO (Owl)");
    EXPECT_EQ(countOf(m_viewer->output(), "selected a QIVO source \n"), 2);
    EXPECT_TRUE(picturesArrive(now()));
}

TEST_F(ViewerTest, ClosingTheWindowEndsInOrderAndSavesTheSettings) {
    const auto publisher = publish("STUDIO", {"Cam 1"});
    startViewer();
    choose(0, 0, "STUDIO (Cam 1)");
    ASSERT_TRUE(picturesArrive());
    pressSwitch("Control+l");
    ASSERT_TRUE(picturesArrive(now()));
    ASSERT_TRUE(closeWindow());
    EXPECT_EQ(m_viewer->wait(seconds(10)), 0) << m_viewer->errors();
    EXPECT_THAT(m_viewer->output(),
                HasSubstr("Destroying the QIVO receiver \nThe QIVO receiver has been destroyed \n"));
    EXPECT_THAT(settings(), HasSubstr("ORVQIVOViewer_isLowBandwith=true"));
    EXPECT_THAT(settings(), HasSubstr("ORVQIVOViewer_mute=false"));
    EXPECT_THAT(settings(), HasSubstr("ORVQIVOViewer_recordFolder="));
}

TEST_F(ViewerTest, TerminationSavesTheSettingsToo) {
    startViewer();
    pressSwitch("Control+l");
    m_viewer->signal(SIGTERM);
    EXPECT_EQ(m_viewer->wait(seconds(10)), 0) << m_viewer->errors();
    EXPECT_THAT(settings(), HasSubstr("ORVQIVOViewer_isLowBandwith=true"));
}

TEST_F(ViewerTest, WithoutALibraryTheViewerStartsAndSaysWhy) {
    // A copy of the program with no library beside it.
    const std::filesystem::path folder = std::filesystem::path(std::getenv("HOME")) / "alone" / "bin";
    std::filesystem::create_directories(folder);
    std::filesystem::copy(VIEWER, folder / "qivo-viewer");
    m_viewer = Process::start({(folder / "qivo-viewer").string()});
    ASSERT_NE(m_viewer, nullptr);
    EXPECT_TRUE(eventually([this] { return window().has_value(); }));
    EXPECT_TRUE(m_viewer->waitForOutput("Cannot run QIVO."));
    EXPECT_THAT(m_viewer->errors(), HasSubstr("libqivo.so: cannot open shared object file"));
    ASSERT_TRUE(closeWindow());
    EXPECT_EQ(m_viewer->wait(seconds(10)), 0);
}

TEST_F(ViewerTest, WithoutADisplayTheViewerSaysSoAndEnds) {
    const auto viewer = Process::start({VIEWER}, {"DISPLAY=:9999"});
    ASSERT_NE(viewer, nullptr);
    EXPECT_EQ(viewer->wait(seconds(10)), 1);
    EXPECT_THAT(viewer->errors(), HasSubstr("display"));
}

} // namespace
} // namespace qivo::test
