#pragma once

#include "tests/support/Process.h"
#include "tests/support/Screen.h"

#include <cstdint>
#include <functional>
#include <gtest/gtest.h>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace qivo::test {

/// The place of the picture inside the view, as a fraction of nothing: whole pixels.
struct Box {
    int x = 0;
    int y = 0;
    int width = 0;
    int height = 0;
};

/// Where a picture of that aspect ratio belongs in a view, worked out in whole numbers.
Box letterBox(int viewWidth, int viewHeight, int aspectWidth = 16, int aspectHeight = 9);

/// Publisher and viewer as processes of their own, and a user in front of the screen.
class ViewerTest : public testing::Test {
  protected:
    void SetUp() override;
    void TearDown() override;

    /// Publishes sources of one machine on loopback and waits until they are served.
    std::unique_ptr<Process> publish(const std::string& machine, const std::vector<std::string>& sources,
                                     const std::vector<std::string>& options = {});
    /// Starts the viewer and waits for its window.
    void startViewer(const std::vector<std::string>& environment = {});
    /// Chooses with the keyboard alone: the machine by its place in the menu, the source by its place in the submenu.
    /// Tries again until the window carries the source's name, since the network takes a moment to tell.
    void choose(int machine, int source, const std::string& name);

    /// Presses a switch's shortcut and waits until the switches at the end of the menu bar look different and stay so:
    /// a switch looks pressed for a moment before it turns.
    void pressSwitch(const std::string& chord);
    /// Clicks the record switch with the mouse, and waits likewise.
    void clickRecordSwitch();
    /// Whether the record switch looks on.
    bool recordSwitchShowsOn() const;

    std::optional<Window> window() const;
    /// Whether there is a window of that title that has the keyboard.
    bool isActive(const std::string& title) const;
    /// Gives the window of that title the keyboard, and waits until it has it. False if that does not come about.
    bool turnTo(const std::string& title) const;
    /// Asks the viewer's window to close. False if there is none.
    bool closeWindow() const;
    /// The picture's own window inside the main window.
    Window view() const;
    /// Sizes the main window so that its view has this size, in pixels.
    bool sizeView(int width, int height) const;
    /// What the screen shows of the view.
    Picture viewPicture() const;
    /// The time drawn into the picture on the screen, in ms since the epoch, read from where the picture belongs.
    std::optional<std::int64_t> shownTime() const;
    /// True once the clock in the picture shows a time after `after` that is at most a second old.
    bool picturesArrive(std::int64_t after = 0, std::chrono::milliseconds deadline = std::chrono::seconds(20)) const;
    /// Expects the colour bars of the test picture in that part of the view.
    static void expectBars(const Picture& picture, const Box& box);
    static std::int64_t now();

    std::unique_ptr<Screen> m_screen;
    std::unique_ptr<Process> m_viewer;
    std::string m_title = "QIVO Viewer";

  private:
    void turnSwitch(const std::function<void()>& turn);
    /// The place of the switches at the right end of the menu bar.
    Window switches() const;
};

} // namespace qivo::test
