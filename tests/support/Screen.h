#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

struct _XDisplay;

namespace qivo::test {

/// A picture read back from the screen: RGBA, rows without padding.
struct Picture {
    int width = 0;
    int height = 0;
    std::vector<std::uint8_t> pixels;

    struct Colour {
        int red = 0;
        int green = 0;
        int blue = 0;
    };
    /// The colour at a place; the place must lie inside.
    Colour at(int x, int y) const;
    /// The colour averaged over a square of 5 x 5 pixels round a place, so that the noise of coding does not matter.
    Colour around(int x, int y) const;
    bool empty() const { return pixels.empty(); }
};

/// A window as the X server knows it; geometry in pixels of the root window.
struct Window {
    unsigned long id = 0;
    int x = 0;
    int y = 0;
    int width = 0;
    int height = 0;
};

/// A user in front of the screen that DISPLAY names: looks at windows, types and clicks through the server, so that
/// what happens is what would happen to a person.
///
/// Thread: one.
class Screen {
  public:
    /// Null if the display cannot be opened or cannot be typed on (no XTEST).
    static std::unique_ptr<Screen> open();
    ~Screen();
    Screen(const Screen&) = delete;
    Screen& operator=(const Screen&) = delete;

    /// The mapped top-level window with this exact title.
    std::optional<Window> findWindow(const std::string& title) const;
    /// The X server's process, for a server on this machine; 0 if it does not tell.
    int serverProcess() const;
    /// Every mapped top-level window's title.
    std::vector<std::string> titles() const;
    /// The largest mapped window inside a window, itself excluded: a native child such as the picture.
    std::optional<Window> largestChild(const Window& parent) const;
    /// Whether the keyboard goes to that top-level window.
    bool isActive(const Window& window) const;
    /// The window's present geometry; empty if it is gone or not mapped.
    std::optional<Window> refresh(const Window& window) const;
    /// What the screen shows in that rectangle, whoever drew it. Empty if it lies outside the screen.
    Picture grab(const Window& area) const;
    Picture grabAll() const;

    /// Presses and releases a chord such as "Alt+s", "Down", "Return", "F11", "Control+q". False for an unknown key.
    bool key(const std::string& chord);
    /// Presses a key, which repeats as the server's keys do until it is released. False for an unknown key.
    bool pressKey(const std::string& name);
    void releaseKey(const std::string& name);
    void moveTo(int x, int y);
    void click(int x, int y);
    void press(int x, int y);
    void release();
    /// Asks the window manager for a size of the window's inside.
    void resize(const Window& window, int width, int height);
    void move(const Window& window, int x, int y);
    /// Asks the window to close, as the button in its frame does.
    void close(const Window& window);
    /// Gives the window the keyboard through the window manager.
    void activate(const Window& window);

  private:
    explicit Screen(_XDisplay* display);
    _XDisplay* m_display;
};

/// Looks again every few milliseconds until the condition holds. False once the deadline has passed.
bool eventually(const std::function<bool()>& condition, std::chrono::milliseconds deadline = std::chrono::seconds(20));

} // namespace qivo::test
