// A camera steered by a user of the viewer: the panel's buttons and keys, and what the published scene then shows.
#include "tests/end-to-end/ViewerFixture.h"
#include "tests/tools/Watcher.h"
#include "tools/publish/PositionCode.h"
#include "tools/publish/TimeCode.h"

#include <cmath>
#include <csignal>
#include <functional>
#include <gmock/gmock.h>
#include <thread>

namespace qivo::test {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using testing::HasSubstr;

constexpr int kSceneShare = 14;        // of 18 parts of the picture's height; below it is the band with the codes
constexpr double kClearlyMoved = 0.02; // of the camera's range of -1 to 1; a tap moves it by half of that
constexpr double kFarIn = 0.25;        // of its range of 0 to 1: seconds from its limit
constexpr double kSamePlace = 0.002;   // two steps of the position code
constexpr milliseconds kStanding(400); // without motion for so long by the picture's clock
constexpr milliseconds kStandsWithin(1000);

/// A place in the panel, by the layout of its interface file; negative counts from the right edge.
struct Place {
    int x;
    int y;
};
constexpr Place kPanLeft{40, 84};
constexpr Place kTiltUp{96, 36};
constexpr Place kZoomIn{-40, 36};
constexpr Place kZoomOut{-40, 132};
constexpr Place kFocus{90, 199}; // the slider's handle, in the middle
constexpr Place kMargin{6, 6};

double distance(const PositionCode& one, const PositionCode& other) {
    return std::abs(one.pan - other.pan) + std::abs(one.tilt - other.tilt) + std::abs(one.zoom - other.zoom);
}

class PTZTest : public ViewerTest {
  protected:
    static constexpr const char* kPanel = "Camera Control";

    /// Where the camera stands and when, as one picture in the viewer's window says.
    struct Shown {
        std::int64_t time = 0;
        PositionCode position;
    };

    std::optional<Shown> shown() const {
        const Picture picture = viewPicture();
        if (picture.empty()) {
            return std::nullopt;
        }
        const Box box = letterBox(picture.width, picture.height);
        const auto stride = static_cast<std::ptrdiff_t>(4) * picture.width;
        const auto* pixels = picture.pixels.data() + box.y * stride + static_cast<std::ptrdiff_t>(4) * box.x;
        const auto time = readTimeCode(pixels, box.width, box.height, stride);
        const auto position = readPositionCode(pixels, box.width, box.height, stride);
        return time && position ? std::optional(Shown{*time, *position}) : std::nullopt;
    }

    /// Of the first source's stream.
    static std::string addressOf(const Process& publisher) {
        return publisher.output().substr(0, publisher.output().find(' '));
    }

    bool shows(const std::function<bool(const PositionCode&)>& condition, milliseconds deadline = seconds(20)) const {
        return eventually(
            [&] {
                const auto now = shown();
                return now && condition(now->position);
            },
            deadline);
    }

    PositionCode position() const {
        std::optional<Shown> now;
        EXPECT_TRUE(eventually([&] { return (now = shown()).has_value(); })) << "no position in the picture";
        return now ? now->position : PositionCode{};
    }

    /// Waits until the camera has not moved for a while, by the pictures' own clock; where it stands then.
    std::optional<PositionCode> stands(milliseconds deadline = seconds(10)) const {
        std::optional<Shown> since;
        const bool stood = eventually(
            [&] {
                const auto next = shown();
                if (next && (!since || distance(next->position, since->position) > kSamePlace)) {
                    since = next;
                }
                return next && since && next->time - since->time >= kStanding.count();
            },
            deadline);
        return stood ? std::optional(since->position) : std::nullopt;
    }

    /// The middle of the scene's red landmark in the view, in pixels; empty if it is not to be seen.
    std::optional<Place> landmark() const {
        const Picture picture = viewPicture();
        const Box box = letterBox(picture.width, picture.height);
        std::int64_t x = 0;
        std::int64_t y = 0;
        int count = 0;
        for (int row = box.y; row < box.y + box.height * kSceneShare / 18; ++row) {
            for (int column = box.x; column < box.x + box.width; ++column) {
                const auto colour = picture.at(column, row);
                if (colour.red > 180 && colour.green < 70 && colour.blue < 70) {
                    x += column;
                    y += row;
                    ++count;
                }
            }
        }
        return count > 100 ? std::optional(Place{static_cast<int>(x / count), static_cast<int>(y / count)})
                           : std::nullopt;
    }

    void openPanel() {
        ASSERT_TRUE(eventually([&] {
            if (const auto main = window()) {
                m_screen->activate(*main);
            }
            m_screen->key("Alt+c");
            m_screen->key("c"); // by its letter: its place depends on whether the page before it is known
            if (eventually([&] { return m_screen->findWindow(kPanel).has_value(); }, milliseconds(700))) {
                return true;
            }
            m_screen->key("Escape");
            m_screen->key("Escape");
            return false;
        })) << "the panel cannot be opened from the menu";
        ASSERT_TRUE(eventually([&] { return isActive(kPanel); }));
    }

    /// Watches a camera with the panel open, once it obeys.
    void steer(int source, const std::string& name) {
        startViewer();
        choose(0, source, name);
        ASSERT_TRUE(picturesArrive());
        ASSERT_NO_FATAL_FAILURE(openPanel());
        ASSERT_NO_FATAL_FAILURE(waitForControl());
    }

    /// What the camera is able to do is asked in the background, and a command before that goes nowhere.
    void waitForControl() {
        const PositionCode start = position();
        ASSERT_TRUE(eventually([&] {
            m_screen->pressKey("Right");
            std::this_thread::sleep_for(milliseconds(100));
            m_screen->releaseKey("Right");
            return shows([&](const PositionCode& at) { return distance(at, start) > kSamePlace; }, milliseconds(300));
        })) << "the camera obeys no key";
        ASSERT_TRUE(stands());
    }

    void press(const Place& place) {
        const auto at = onScreen(place);
        m_screen->press(at.x, at.y);
    }

    void dragTo(const Place& place) {
        const auto at = onScreen(place);
        m_screen->moveTo(at.x, at.y);
    }

    Place onScreen(const Place& place) const {
        const auto panel = m_screen->findWindow(kPanel);
        if (!panel) {
            ADD_FAILURE() << "the panel is not open";
            return {1, 1};
        }
        return {panel->x + (place.x < 0 ? panel->width : 0) + place.x, panel->y + place.y};
    }
};

TEST_F(PTZTest, AHeldButtonMovesTheSceneAndReleaseStopsIt) {
    const auto publisher = publish("STUDIO", {"Cam 1"}, {"--ptz"});
    ASSERT_NO_FATAL_FAILURE(steer(0, "STUDIO (Cam 1)"));
    const PositionCode start = position();
    const auto before = landmark();
    ASSERT_TRUE(before);
    press(kPanLeft);
    EXPECT_TRUE(shows([&](const PositionCode& at) { return at.pan < start.pan - 2 * kClearlyMoved; }));
    m_screen->release();
    const auto end = stands();
    ASSERT_TRUE(end) << "the camera runs away";
    EXPECT_NEAR(end->tilt, start.tilt, kSamePlace);
    EXPECT_NEAR(end->zoom, start.zoom, kSamePlace);
    const auto after = landmark();
    ASSERT_TRUE(after);
    EXPECT_GT(after->x, before->x + 10) << "the camera looks farther to the left, so that the scene moves to the right";
    EXPECT_NEAR(after->y, before->y, 2);
}

TEST_F(PTZTest, DraggingOffTheZoomOutButtonStopsTheZoom) {
    const auto publisher = publish("STUDIO", {"Cam 1"}, {"--ptz"});
    ASSERT_NO_FATAL_FAILURE(steer(0, "STUDIO (Cam 1)"));
    press(kZoomIn);
    EXPECT_TRUE(shows([&](const PositionCode& at) { return at.zoom > kFarIn; }));
    m_screen->release();
    const auto near = stands();
    ASSERT_TRUE(near);
    press(kZoomOut);
    EXPECT_TRUE(shows([&](const PositionCode& at) { return at.zoom < near->zoom - kClearlyMoved; }));
    dragTo(kMargin);
    const auto end = stands();
    ASSERT_TRUE(end) << "the button is held elsewhere, and the camera goes on";
    EXPECT_GT(end->zoom, kSamePlace) << "it stopped only at its limit";
    EXPECT_THAT(m_viewer->errors(), HasSubstr("exited"));
    m_screen->release();
}

TEST_F(PTZTest, APresetIsStoredAndRecalled) {
    const auto publisher = publish("STUDIO", {"Cam 1"}, {"--ptz"});
    ASSERT_NO_FATAL_FAILURE(steer(0, "STUDIO (Cam 1)"));
    const PositionCode start = position();
    const auto before = landmark();
    ASSERT_TRUE(before);
    m_screen->key("Alt+t");
    std::this_thread::sleep_for(milliseconds(200)); // a button pressed by key turns when it has looked pressed
    m_screen->key("3");
    press(kTiltUp);
    EXPECT_TRUE(shows([&](const PositionCode& at) { return at.tilt > start.tilt + 2 * kClearlyMoved; }));
    m_screen->release();
    ASSERT_TRUE(stands());
    m_screen->key("3");
    EXPECT_TRUE(shows([&](const PositionCode& at) { return distance(at, start) <= kSamePlace; }));
    ASSERT_TRUE(stands());
    const auto after = landmark();
    ASSERT_TRUE(after);
    EXPECT_NEAR(after->x, before->x, 2);
    EXPECT_NEAR(after->y, before->y, 2);
}

/// The pictures of a camera as a second watcher gets them, by the clock in them.
struct Track {
    std::optional<PositionCode> last;
    std::int64_t lastPicture = 0;
    // The camera last moved between these two pictures. They may be far apart where the machine is busy.
    std::int64_t beforeMotion = 0;
    std::int64_t lastMotion = 0;
    int motions = 0;
};

void followNext(Watcher& watcher, Track& track) {
    const auto frame = watcher.next(seconds(5));
    ASSERT_TRUE(frame) << "no more pictures";
    const auto at = readPositionCode(frame->pixels.data(), frame->width, frame->height,
                                     static_cast<std::ptrdiff_t>(4) * frame->width);
    const auto time = frame->timeCode();
    if (!at || !time) {
        return;
    }
    if (track.last && distance(*at, *track.last) > 0) {
        ++track.motions;
        track.beforeMotion = track.lastPicture;
        track.lastMotion = *time;
    }
    track.lastPicture = *time;
    track.last = at;
}

/// Follows the camera until the clock in its pictures says that time.
void follow(Watcher& watcher, std::int64_t until, Track& track) {
    while (track.lastPicture < until) {
        ASSERT_NO_FATAL_FAILURE(followNext(watcher, track));
    }
}

/// Follows the camera until it has moved in some pictures.
void followMotion(Watcher& watcher, Track& track) {
    constexpr int kEnough = 4;
    const auto limit = std::chrono::steady_clock::now() + seconds(20);
    while (track.motions < kEnough) {
        ASSERT_LT(std::chrono::steady_clock::now(), limit) << "the camera does not move";
        ASSERT_NO_FATAL_FAILURE(followNext(watcher, track));
    }
}

TEST_F(PTZTest, TheFocusSliderGoesFromFarToNearAndTheAutomaticTakesItBack) {
    const auto publisher = publish("STUDIO", {"Cam 1"}, {"--ptz"});
    ASSERT_NO_FATAL_FAILURE(steer(0, "STUDIO (Cam 1)"));
    press(kFocus);
    dragTo({-1, kFocus.y});
    EXPECT_TRUE(shows([](const PositionCode& at) { return at.focus == 0; })) << "not the nearest";
    dragTo({1, kFocus.y});
    EXPECT_TRUE(shows([](const PositionCode& at) { return at.focus == 1; })) << "not the farthest";
    m_screen->release();
    m_screen->key("Alt+a");
    EXPECT_TRUE(shows([](const PositionCode& at) { return std::abs(at.focus - 0.5) < 0.01; }));
}

TEST_F(PTZTest, TurningToTheMainWindowStopsTheCameraAndAnotherSourceClosesThePanel) {
    const auto publisher = publish("STUDIO", {"Cam 1", "Cam 2"}, {"--ptz"});
    ASSERT_NO_FATAL_FAILURE(steer(0, "STUDIO (Cam 1)"));
    Watcher watcher(addressOf(*publisher), "tcp");
    Track track;
    press(kPanLeft);
    ASSERT_NO_FATAL_FAILURE(followMotion(watcher, track));
    const std::int64_t turned = now();
    ASSERT_TRUE(turnTo(m_title));
    const std::int64_t isThere = now(); // the window manager takes its time, too
    ASSERT_NO_FATAL_FAILURE(follow(watcher, isThere + kStandsWithin.count() + 1, track)); // before what takes long
    choose(0, 1, "STUDIO (Cam 2)");
    EXPECT_TRUE(eventually([&] { return !m_screen->findWindow(kPanel).has_value(); }));
    ASSERT_NO_FATAL_FAILURE(follow(watcher, now() + kStandsWithin.count(), track));
    m_screen->release();
    ASSERT_NO_FATAL_FAILURE(follow(watcher, now() + kStandsWithin.count(), track));
    EXPECT_GT(track.lastMotion, turned - 200) << "it stood before";
    EXPECT_LE(track.beforeMotion, isThere + kStandsWithin.count()) << "in ms; the button was held until the end";
    ASSERT_TRUE(picturesArrive(now()));
    EXPECT_TRUE(shows([](const PositionCode& at) { return distance(at, {}) <= kSamePlace; }));
}

TEST_F(PTZTest, LowBandwidthToggledWhileAButtonIsHeldSteersThisCameraAlone) {
    const auto publisher = publish("STUDIO", {"Cam 1", "Cam 2"}, {"--ptz"});
    ASSERT_NO_FATAL_FAILURE(steer(0, "STUDIO (Cam 1)"));
    press(kPanLeft);
    m_screen->key("Control+l");
    ASSERT_TRUE(picturesArrive(now() + 500));
    EXPECT_TRUE(stands()) << "the receiver that moved it has gone";
    m_screen->release();
    ASSERT_TRUE(m_screen->findWindow(kPanel)) << "the panel stays";
    ASSERT_TRUE(turnTo(kPanel));
    ASSERT_NO_FATAL_FAILURE(waitForControl());
    ASSERT_TRUE(turnTo(m_title));
    choose(0, 1, "STUDIO (Cam 2)");
    EXPECT_TRUE(shows([](const PositionCode& at) { return distance(at, {}) <= kSamePlace; }))
        << "the other camera was steered";
    EXPECT_TRUE(m_viewer->running());
}

TEST_F(PTZTest, AViewerKilledWhileAButtonIsHeldLeavesTheCameraStandingWithinASecond) {
    const auto publisher = publish("STUDIO", {"Cam 1"}, {"--ptz"});
    ASSERT_NO_FATAL_FAILURE(steer(0, "STUDIO (Cam 1)"));
    Watcher watcher(addressOf(*publisher), "tcp");
    Track track;
    press(kPanLeft);
    ASSERT_NO_FATAL_FAILURE(followMotion(watcher, track));
    const std::int64_t killed = now();
    m_viewer->signal(SIGKILL);
    ASSERT_NO_FATAL_FAILURE(follow(watcher, killed + 2 * kStandsWithin.count(), track));
    EXPECT_GT(track.lastMotion, killed - 200) << "it stood before";
    EXPECT_LE(track.beforeMotion, killed + kStandsWithin.count()) << "in ms";
    m_viewer->wait(seconds(5));
    m_screen->release();
}

} // namespace
} // namespace qivo::test
