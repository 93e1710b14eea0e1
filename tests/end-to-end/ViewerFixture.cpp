#include "tests/end-to-end/ViewerFixture.h"

#include "tests/runtime/Patience.h"
#include "tools/publish/TimeCode.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <thread>
#include <utility>

namespace qivo::test {
namespace {

constexpr int kSwitchesWidth = 90;                            // pixels at the right end of the menu bar
constexpr int kRecordSwitchMiddle = 21;                       // pixels from their left
constexpr int kRecordSwitchRing = 10;                         // pixels across, at the least; the disc is smaller
constexpr int kRed = 80;                                      // of 255: more than this above the other colours
constexpr auto kPressedLook = std::chrono::milliseconds(150); // longer than a switch looks pressed before it turns
constexpr int kColourTolerance = 14; // of 255: what two colour conversions and a lossy coder may do to a flat area

} // namespace

Box letterBox(int viewWidth, int viewHeight, int aspectWidth, int aspectHeight) {
    if (viewWidth * aspectHeight < viewHeight * aspectWidth) {
        const int height = (2 * viewWidth * aspectHeight + aspectWidth) / (2 * aspectWidth);
        return {0, (viewHeight - height) / 2, viewWidth, height};
    }
    const int width = (2 * viewHeight * aspectWidth + aspectHeight) / (2 * aspectHeight);
    return {(viewWidth - width) / 2, 0, width, viewHeight};
}

void ViewerTest::SetUp() {
    m_screen = Screen::open();
    ASSERT_NE(m_screen, nullptr) << "this test needs a screen; run it through tests/support/launch --network --display";
    // The launcher's own folder for this run, which an earlier case of the same run may have used. Never a user's.
    const std::filesystem::path settings = std::string(std::getenv("HOME")) + "/.config";
    ASSERT_EQ(settings.string().rfind(std::filesystem::temp_directory_path().string(), 0), 0U)
        << "run this test through tests/support/launch";
    std::filesystem::remove_all(settings);
}

void ViewerTest::TearDown() {
    if (HasFailure() && m_viewer) {
        std::fprintf(stderr, "viewer, standard output:\n%s\nviewer, standard error:\n%s\n", m_viewer->output().c_str(),
                     m_viewer->errors().c_str());
    }
}

std::unique_ptr<Process> ViewerTest::publish(const std::string& machine, const std::vector<std::string>& sources,
                                             const std::vector<std::string>& options) {
    std::vector<std::string> command = {PUBLISH, "--loopback-only", "--machine", machine};
    for (const auto& source : sources) {
        command.insert(command.end(), {"--source", source});
        command.insert(command.end(), options.begin(), options.end());
    }
    auto publisher = Process::start(command);
    if (publisher == nullptr || !publisher->waitForOutput("(" + sources.back() + ")")) {
        ADD_FAILURE() << "the publisher serves nothing: " << (publisher ? publisher->errors() : "not started");
    }
    return publisher;
}

void ViewerTest::startViewer(const std::vector<std::string>& environment) {
    m_viewer = Process::start({VIEWER}, environment);
    ASSERT_NE(m_viewer, nullptr);
    ASSERT_TRUE(eventually([this] { return window().has_value(); })) << m_viewer->errors();
    ASSERT_TRUE(turnTo(m_title));
    // Drawn for the first time, too: what is compared later must not change for that reason alone.
    Picture last;
    ASSERT_TRUE(eventually([&] {
        std::this_thread::sleep_for(kPressedLook);
        const auto main = window();
        const Picture earlier = std::exchange(last, main ? m_screen->grab(*main) : Picture());
        return main && !last.empty() && last.pixels == earlier.pixels && m_screen->largestChild(*main);
    }));
}

void ViewerTest::choose(int machine, int source, const std::string& name) {
    const bool chosen = eventually([&] {
        m_screen->key("Alt+s");
        for (int i = 0; i < machine; ++i) {
            m_screen->key("Down");
        }
        m_screen->key("Right");
        for (int i = 0; i < source; ++i) {
            m_screen->key("Down");
        }
        m_screen->key("Return");
        if (eventually([&] { return m_screen->findWindow(name).has_value(); }, std::chrono::milliseconds(700))) {
            return true;
        }
        for (int i = 0; i < 3; ++i) {
            m_screen->key("Escape");
        }
        return false;
    });
    ASSERT_TRUE(chosen) << "'" << name << "' could not be chosen";
    m_title = name;
}

void ViewerTest::pressSwitch(const std::string& chord) {
    turnSwitch([&] { m_screen->key(chord); });
}

void ViewerTest::clickRecordSwitch() {
    const Window all = switches();
    turnSwitch([&] { m_screen->click(all.x + kRecordSwitchMiddle, all.y + all.height / 2); });
}

void ViewerTest::turnSwitch(const std::function<void()>& turn) {
    const Picture before = m_screen->grab(switches());
    turn();
    Picture last = before;
    EXPECT_TRUE(eventually([&] {
        std::this_thread::sleep_for(kPressedLook);
        const Picture earlier = std::exchange(last, m_screen->grab(switches()));
        return last.pixels != before.pixels && last.pixels == earlier.pixels;
    })) << "the switch looks as before";
}

Window ViewerTest::switches() const {
    const Window inside = view();
    const int height = inside.y - window().value_or(inside).y;
    return {0, inside.x + inside.width - kSwitchesWidth, inside.y - height, kSwitchesWidth, height};
}

bool ViewerTest::recordSwitchShowsOn() const {
    const Picture look = m_screen->grab(switches());
    // The ring round the disc is red only while it is on.
    int left = look.width;
    int right = 0;
    for (int x = 0; x < look.width; ++x) {
        const auto colour = look.at(x, look.height / 2);
        if (colour.red > colour.green + kRed && colour.red > colour.blue + kRed) {
            left = std::min(left, x);
            right = std::max(right, x);
        }
    }
    return right - left >= kRecordSwitchRing;
}

std::optional<Window> ViewerTest::window() const {
    return m_screen->findWindow(m_title);
}

bool ViewerTest::isActive(const std::string& title) const {
    const auto found = m_screen->findWindow(title);
    return found && m_screen->isActive(*found);
}

bool ViewerTest::turnTo(const std::string& title) const {
    const auto found = m_screen->findWindow(title);
    if (found) {
        m_screen->activate(*found);
    }
    return eventually([&] { return isActive(title); });
}

bool ViewerTest::closeWindow() const {
    const auto found = window();
    if (found) {
        m_screen->close(*found);
    }
    return found.has_value();
}

Window ViewerTest::view() const {
    const auto main = window();
    const auto child = main ? m_screen->largestChild(*main) : std::nullopt;
    if (!child) {
        ADD_FAILURE() << "the main window holds no picture window";
        return {};
    }
    return *child;
}

bool ViewerTest::sizeView(int width, int height) const {
    const auto found = window();
    if (!found) {
        return false;
    }
    const Window& main = *found;
    const Window inside = view();
    m_screen->move(main, 0, 0);
    m_screen->resize(main, width + main.width - inside.width, height + main.height - inside.height);
    return eventually([&] { return view().width == width && view().height == height; });
}

Picture ViewerTest::viewPicture() const {
    return m_screen->grab(view());
}

std::optional<std::int64_t> ViewerTest::shownTime() const {
    const Picture picture = viewPicture();
    if (picture.empty()) {
        return std::nullopt;
    }
    const Box box = letterBox(picture.width, picture.height);
    const auto stride = static_cast<std::ptrdiff_t>(4) * picture.width;
    return readTimeCode(picture.pixels.data() + box.y * stride + static_cast<std::ptrdiff_t>(4) * box.x, box.width,
                        box.height, stride);
}

bool ViewerTest::picturesArrive(std::int64_t after, std::chrono::milliseconds deadline) const {
    constexpr std::int64_t kFreshMs = kSanitizerPatience > 1 ? 3000 : 1000;
    return eventually(
        [&] {
            const auto time = shownTime();
            return time && *time > after && std::abs(now() - *time) <= kFreshMs;
        },
        deadline);
}

void ViewerTest::expectBars(const Picture& picture, const Box& box) {
    // 75 % bars: white, yellow, cyan, green, magenta, red, blue.
    static constexpr int kLevel = 191;
    static constexpr std::array<std::array<int, 3>, 7> kBars = {
        {{1, 1, 1}, {1, 1, 0}, {0, 1, 1}, {0, 1, 0}, {1, 0, 1}, {1, 0, 0}, {0, 0, 1}}};
    for (std::size_t bar = 0; bar < kBars.size(); ++bar) {
        const int x = box.x + static_cast<int>((2 * bar + 1) * static_cast<std::size_t>(box.width) / 14);
        const Picture::Colour seen = picture.around(x, box.y + box.height / 8);
        EXPECT_NEAR(seen.red, kLevel * kBars[bar][0], kColourTolerance) << "bar " << bar;
        EXPECT_NEAR(seen.green, kLevel * kBars[bar][1], kColourTolerance) << "bar " << bar;
        EXPECT_NEAR(seen.blue, kLevel * kBars[bar][2], kColourTolerance) << "bar " << bar;
    }
}

std::int64_t ViewerTest::now() {
    using namespace std::chrono;
    return duration_cast<milliseconds>(system_clock::now().time_since_epoch()).count();
}

} // namespace qivo::test
