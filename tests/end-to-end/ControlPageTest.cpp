#include "tests/end-to-end/ViewerFixture.h"
#include "tests/end-to-end/WebBrowser.h"

#include "tools/publish/PositionCode.h"

#include <cmath>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <gmock/gmock.h>
#include <thread>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;

// Keys as WebDriver writes them: U+E012, U+E010, U+E011.
constexpr const char* arrowLeft = "\xEE\x80\x92";
constexpr const char* endKey = "\xEE\x80\x90";
constexpr const char* homeKey = "\xEE\x80\x91";

/// A camera, its viewer, and the page that the viewer opens in a browser.
class ControlPagesTest : public ViewerTest {
  protected:
    void SetUp() override {
        ViewerTest::SetUp();
        m_folder = std::string(std::getenv("HOME")) + "/bin";
        std::filesystem::create_directories(m_folder);
        std::filesystem::remove(m_folder + "/opened");
        serve();
    }
    void serve(const std::vector<std::string>& more = {}) {
        m_publisher.reset();
        std::vector<std::string> options{"--ptz", "--http-port", "0"};
        options.insert(options.end(), more.begin(), more.end());
        m_publisher = publish("STUDIO", {"Cam 1"}, options);
        ASSERT_TRUE(m_publisher && m_publisher->waitForOutput(", ONVIF"));
    }

    /// In place of the desktop's own: notes the address that it is to open.
    void makeOpener() const {
        const std::string opener = m_folder + "/xdg-open";
        std::ofstream(opener) << "#!/bin/sh\nprintf '%s' \"$1\" >'" << m_folder << "/opened'\n";
        std::filesystem::permissions(opener, std::filesystem::perms::owner_all);
    }
    std::string opened() const {
        std::string address;
        std::ifstream(m_folder + "/opened") >> address;
        return address;
    }
    std::string pageAddress() const {
        const std::string output = m_publisher->output();
        const std::size_t begin = output.find("http://");
        return output.substr(begin, output.find(' ', begin) - begin);
    }
    /// `login` is "USER:PASSWORD@" or empty.
    void openPage(bool phone = false, const std::string& login = "") {
        m_browser = WebBrowser::start(phone);
        ASSERT_NE(m_browser, nullptr) << "no Chromium";
        m_browser->open(pageAddress().insert(std::string("http://").size(), login));
        ASSERT_TRUE(eventually([this] { return position().has_value(); }));
        moveSlowly();
    }
    /// At full speed the camera is at its end before a browser on a busy machine has told where it is.
    void moveSlowly() {
        m_browser->run("const full = window.sum;"
                       "window.sum = () => {"
                       "  const speeds = full();"
                       "  return {pan: speeds.pan / 8, tilt: speeds.tilt / 8, zoom: speeds.zoom / 8};"
                       "};");
    }

    std::optional<PositionCode> position() {
        const CanvasPicture picture = m_browser->canvas("#picture");
        return picture.pixels.empty() ? std::nullopt
                                      : readPositionCode(picture.pixels.data(), picture.width, picture.height,
                                                         static_cast<std::ptrdiff_t>(4) * picture.width);
    }
    /// The same, of the next picture that can be read.
    PositionCode place() {
        std::optional<PositionCode> now;
        EXPECT_TRUE(eventually([&] { return (now = position()).has_value(); })) << "no position in the picture";
        return now.value_or(PositionCode{});
    }
    /// Waits for a picture of the camera for which the condition holds.
    bool seen(const std::function<bool(const PositionCode&)>& condition) {
        return eventually([&] {
            const auto now = position();
            return now && condition(*now);
        });
    }
    /// The scene, without what lies over it: the average colour of places all over it.
    std::vector<int> scene() {
        constexpr int columns = 16;
        constexpr int rows = 8;
        const CanvasPicture picture = m_browser->canvas("#picture");
        std::vector<int> colours;
        for (int i = 0; !picture.pixels.empty() && i < columns * rows; ++i) {
            const int x = (2 * (i % columns) + 1) * picture.width / (2 * columns);
            const int y = (2 * (i / columns) + 1) * picture.height * 3 / 4 / (2 * rows);
            const auto at = 4 * (static_cast<std::size_t>(y) * picture.width + x);
            colours.insert(colours.end(), picture.pixels.begin() + static_cast<std::ptrdiff_t>(at),
                           picture.pixels.begin() + static_cast<std::ptrdiff_t>(at) + 3);
        }
        return colours;
    }
    static double difference(const std::vector<int>& one, const std::vector<int>& other) {
        double sum = one.size() == other.size() && !one.empty() ? 0 : NAN;
        for (std::size_t i = 0; i < one.size() && i < other.size(); ++i) {
            sum += std::abs(one[i] - other[i]);
        }
        return sum / static_cast<double>(one.size());
    }
    /// True once several pictures in a row, of at least `time` in all, are of the same place.
    bool stands(std::chrono::milliseconds time = 400ms) {
        std::optional<PositionCode> last;
        auto since = std::chrono::steady_clock::now();
        return eventually([&] {
            const auto now = position();
            const bool same =
                last && now && last->pan == now->pan && last->tilt == now->tilt && last->zoom == now->zoom;
            if (!same) {
                since = std::chrono::steady_clock::now();
            }
            last = now;
            return same && std::chrono::steady_clock::now() - since >= time;
        });
    }

    std::string m_folder;
    std::unique_ptr<Process> m_publisher;
    std::unique_ptr<WebBrowser> m_browser;
};

TEST_F(ControlPagesTest, theViewersCommandOpensThePageAndAButtonHeldMovesThePicture) {
    makeOpener();
    startViewer({"PATH=" + m_folder + ":" + std::getenv("PATH")});
    choose(1, 0, "STUDIO (Cam 1)");
    ASSERT_TRUE(picturesArrive());
    m_screen->key("Control+b");
    ASSERT_TRUE(eventually([this] { return !opened().empty(); })) << m_viewer->errors();
    EXPECT_EQ(opened(), pageAddress());

    m_browser = WebBrowser::start();
    ASSERT_NE(m_browser, nullptr) << "no Chromium";
    m_browser->open(opened());
    ASSERT_TRUE(seen([](const PositionCode& now) { return std::abs(now.pan) < 0.01; }));
    EXPECT_EQ(m_browser->text("#name"), "STUDIO (Cam 1)");
    // This page and the viewer, which takes picture and sound by two connections and counts as one.
    EXPECT_TRUE(eventually([this] { return m_browser->text("#viewers") == "2 viewers"; }))
        << m_browser->text("#viewers");

    moveSlowly();
    const std::vector<int> before = scene();
    m_browser->press(".left");
    EXPECT_TRUE(seen([](const PositionCode& now) { return now.pan < -0.2; }));
    EXPECT_GT(difference(before, scene()), 8);
    m_browser->releaseAll();
    EXPECT_TRUE(stands());
    const std::vector<int> after = scene();
    std::this_thread::sleep_for(300ms);
    EXPECT_LT(difference(after, scene()), 1);
    EXPECT_GT(place().pan, -0.95) << "it ran to its end";
    EXPECT_THAT(m_browser->complaints(), testing::IsEmpty());
}

TEST_F(ControlPagesTest, leavingTheButtonAnotherTabAndAStoppedBrowserStopTheCamera) {
    ASSERT_NO_FATAL_FAILURE(openPage());
    m_browser->press(".left");
    ASSERT_TRUE(seen([](const PositionCode& now) { return now.pan < -0.05; }));
    m_browser->dragTo("#picture");
    EXPECT_TRUE(stands());
    EXPECT_GT(place().pan, -0.95);
    m_browser->releaseAll();

    m_browser->press(".right");
    ASSERT_TRUE(seen([](const PositionCode& now) { return now.pan > 0; }));
    m_browser->run("Object.defineProperty(document, 'hidden', {value: true, configurable: true});"
                   "document.dispatchEvent(new Event('visibilitychange'));"
                   "Object.defineProperty(document, 'hidden', {value: false});"
                   "document.dispatchEvent(new Event('visibilitychange'));");
    EXPECT_TRUE(stands());
    EXPECT_LT(place().pan, 0.95);
    m_browser->releaseAll();

    // The page is still there and renews no more, as where its machine fell asleep.
    m_browser->press("[data-zoom=\"1\"]");
    ASSERT_TRUE(seen([](const PositionCode& now) { return now.zoom > 0.05; }));
    m_browser->run("window.fetchAsItWas = window.fetch;"
                   "window.fetch = (url, ...rest) => url.endsWith('/command') ? new Promise(() => {}) : "
                   "window.fetchAsItWas(url, ...rest);");
    EXPECT_TRUE(stands(1200ms));
    EXPECT_LT(place().zoom, 0.95);
}

TEST_F(ControlPagesTest, keysTurnStoreAndRecall) {
    ASSERT_NO_FATAL_FAILURE(openPage());
    m_browser->typeKey("s");
    m_browser->typeKey("3");
    EXPECT_TRUE(eventually(
        [this] { return m_browser->run("return document.querySelectorAll('#presets .kept').length").toInt() == 1; }));
    m_browser->holdKey(arrowLeft);
    EXPECT_TRUE(seen([](const PositionCode& now) { return now.pan < -0.1; }));
    m_browser->releaseAll();
    EXPECT_TRUE(stands());
    EXPECT_LT(place().pan, -0.1);
    m_browser->holdKey("+");
    EXPECT_TRUE(seen([](const PositionCode& now) { return now.zoom > 0.1; }));
    m_browser->releaseAll();
    EXPECT_TRUE(stands());
    m_browser->typeKey("3");
    EXPECT_TRUE(seen([](const PositionCode& now) { return std::abs(now.pan) < 0.01 && now.zoom < 0.01; }));
    m_browser->typeKey("4"); // holds nothing
    EXPECT_TRUE(eventually([this] { return m_browser->text("#hint") == "Preset 4 holds nothing yet"; }));
}

TEST_F(ControlPagesTest, aFingerOnAPhoneTurnsUntilItLeaves) {
    ASSERT_NO_FATAL_FAILURE(openPage(true));
    EXPECT_EQ(m_browser->run("return document.documentElement.scrollWidth > innerWidth").toBool(true), false);
    m_browser->press(".up");
    EXPECT_TRUE(seen([](const PositionCode& now) { return now.tilt > 0.1; }));
    m_browser->releaseAll();
    EXPECT_TRUE(stands());
    EXPECT_LT(place().tilt, 0.95);
    m_browser->click("#store");
    m_browser->click("#presets button:nth-child(2)");
    EXPECT_TRUE(eventually([this] {
        return m_browser->run("return document.querySelector('#presets button:nth-child(2)').className").toString() ==
               "kept";
    }));
}

TEST_F(ControlPagesTest, theLoginOfThePageIsTheLoginOfItsCommands) {
    serve({"--login", "ann:secret"});
    ASSERT_NO_FATAL_FAILURE(openPage(false, "ann:secret@"));
    EXPECT_EQ(m_browser->text("#name"), "STUDIO (Cam 1)");
    m_browser->press(".left");
    EXPECT_TRUE(seen([](const PositionCode& now) { return now.pan < -0.2; }));
    m_browser->releaseAll();
    EXPECT_TRUE(stands());
    EXPECT_GT(place().pan, -0.95);
    EXPECT_TRUE(eventually([this] { return m_browser->text("#state") == "Live"; }));
    EXPECT_EQ(m_browser->text("#viewers"), "1 viewer");
}

TEST_F(ControlPagesTest, theFocusGoesFromFarToNearAndBackToTheAutomatic) {
    ASSERT_NO_FATAL_FAILURE(openPage());
    const auto isAutomatic = [this] {
        return m_browser->run("return document.getElementById(\"automatic\").checked").toBool();
    };
    EXPECT_TRUE(eventually(isAutomatic));
    m_browser->run("document.getElementById('focus').focus()");
    m_browser->typeKey(endKey);
    EXPECT_TRUE(seen([](const PositionCode& now) { return now.focus < 0.01; })) << "not the nearest";
    EXPECT_FALSE(isAutomatic());
    m_browser->typeKey(homeKey);
    EXPECT_TRUE(seen([](const PositionCode& now) { return now.focus > 0.99; })) << "not the farthest";
    m_browser->click("#automatic");
    EXPECT_TRUE(seen([](const PositionCode& now) { return std::abs(now.focus - 0.5) < 0.01; }));
    EXPECT_TRUE(isAutomatic());
    EXPECT_TRUE(eventually([this] {
        return m_browser->run("return Number(document.getElementById(\"focus\").value)").toDouble() == 0.5;
    }));
    m_browser->click("#automatic");
    EXPECT_TRUE(eventually([this] {
        return m_browser->run("return fetch(at('state')).then((answer) => answer.json())")["automaticFocus"] == false;
    }));
    EXPECT_THAT(m_browser->complaints(), testing::IsEmpty());
}

TEST_F(ControlPagesTest, onlyTheNewestPlaceOfTheFocusIsSent) {
    ASSERT_NO_FATAL_FAILURE(openPage());
    // The first command is held back for a while; meanwhile the slider moves on.
    m_browser->run("window.places = []; window.fetchAsItWas = window.fetch;"
                   "window.fetch = async (url, options) => {"
                   "  if (url.endsWith('/command')) {"
                   "    window.places.push(JSON.parse(options.body).value);"
                   "    await new Promise((done) => setTimeout(done, window.places.length === 1 ? 500 : 0));"
                   "  }"
                   "  return window.fetchAsItWas(url, options);"
                   "};"
                   "for (const place of [0.9, 0.8, 0.7, 0.6, 0.2]) {"
                   "  const slider = document.getElementById('focus');"
                   "  slider.value = place; slider.dispatchEvent(new Event('input'));"
                   "}");
    EXPECT_TRUE(seen([](const PositionCode& now) { return std::abs(now.focus - 0.8) < 0.01; }));
    const QJsonArray places = m_browser->run("return window.places").toArray();
    EXPECT_EQ(places, (QJsonArray{0.1, 0.8})) << places.size();
}

TEST_F(ControlPagesTest, aPublisherThatGoesIsSaid) {
    ASSERT_NO_FATAL_FAILURE(openPage());
    ASSERT_TRUE(eventually([this] { return m_browser->text("#state") == "Live"; }));
    m_publisher->signal(SIGKILL);
    EXPECT_TRUE(eventually([this] { return m_browser->text("#state") == "No connection"; }));
    EXPECT_EQ(m_browser->text("#notice"), "The connection is broken. Trying again.");
}

} // namespace
} // namespace qivo::test
