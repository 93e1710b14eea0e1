// The bars under a compositor, with a bright screen behind the window that would shine through.

#include "tests/support/Process.h"
#include "tests/video/WindowFixture.h"

#include <cstdlib>
#include <xcb/xcb.h>

namespace qivo::test {
namespace {

class CompositorPeerTest : public WindowFixture {
  protected:
    void SetUp() override {
        WindowFixture::SetUp();
        const auto painter = Process::start({"/usr/bin/xsetroot", "-solid", "#00ff00"});
        ASSERT_TRUE(painter);
        ASSERT_EQ(painter->wait(std::chrono::seconds(10)), 0);
        compositor = Process::start({"/usr/bin/picom", "--backend", "xrender", "--config", "/dev/null"});
        ASSERT_TRUE(compositor);
        ASSERT_TRUE(eventually(compositorRuns));
    }

    void TearDown() override {
        EXPECT_TRUE(compositor->running()) << compositor->errors();
        WindowFixture::TearDown();
        compositor.reset();
    }

    /// A compositor announces itself by owning this selection.
    static bool compositorRuns() {
        static constexpr char kName[] = "_NET_WM_CM_S0"; // NOLINT(modernize-avoid-c-arrays): its length is needed
        xcb_connection_t* connection = qApp->nativeInterface<QNativeInterface::QX11Application>()->connection();
        const std::unique_ptr<xcb_intern_atom_reply_t, decltype(&std::free)> atom(
            xcb_intern_atom_reply(connection, xcb_intern_atom(connection, 0, sizeof kName - 1, kName), nullptr),
            std::free);
        const std::unique_ptr<xcb_get_selection_owner_reply_t, decltype(&std::free)> owner(
            xcb_get_selection_owner_reply(connection, xcb_get_selection_owner(connection, atom->atom), nullptr),
            std::free);
        return owner && owner->owner != XCB_NONE;
    }

    std::unique_ptr<Process> compositor;
};

TEST_F(CompositorPeerTest, BarsAreBlackAndOpaque) {
    showRed(640, 360);
    window->resize(1000, 1000);
    ASSERT_TRUE(waitForColour(1000, 1000, 500, 500, kRed));
    ASSERT_TRUE(waitForColour(1000, 1000, 500, 218, kBlack));
    EXPECT_TRUE(runUntil([&] { return colour(grab(), 5, 5) == kBlack; }));
    expectBox(grab(), 0, 1000 - 218 - 563, 1000, 563, kRed);
}

TEST_F(CompositorPeerTest, ATransparentPictureShowsNothingOfWhatIsBehind) {
    show(640, 360);
    FakeQivo::instance().addVideo(64, 36, 0x0000ff00, kWide);
    FakeQivo::instance().addVideo(64, 36, 0x0000ff00, kWide);
    select();
    ASSERT_TRUE(runUntil([] { return FakeQivo::instance().callsOf("recv_capture_v2").size() > 5; }));
    EXPECT_TRUE(waitForColour(640, 360, 320, 180, kBlack));
}

} // namespace
} // namespace qivo::test
