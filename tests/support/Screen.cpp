#include "tests/support/Screen.h"

#include <X11/Xatom.h>
#include <X11/Xlib.h>
#include <X11/Xutil.h>
#include <X11/extensions/XTest.h>
#include <X11/keysym.h>
#include <algorithm>
#include <array>
#include <cstring>
#include <sys/socket.h>
#include <thread>

namespace qivo::test {
namespace {

constexpr auto kLookEvery = std::chrono::milliseconds(10);

/// A window may go while it is being asked about; that is an answer, not a reason to end the program.
int ignoreError(Display*, XErrorEvent*) {
    return 0;
}

template <typename T>
using Owned = std::unique_ptr<T, int (*)(void*)>;

std::vector<::Window> windowList(Display* display, const char* property) {
    Atom type = None;
    int format = 0;
    unsigned long count = 0;
    unsigned long left = 0;
    unsigned char* data = nullptr;
    XGetWindowProperty(display, DefaultRootWindow(display), XInternAtom(display, property, False), 0, 4096, False,
                       XA_WINDOW, &type, &format, &count, &left, &data);
    const Owned<unsigned char> owner(data, XFree);
    if (data == nullptr || format != 32 || count == 0) {
        return {};
    }
    std::vector<::Window> windows(count);
    std::memcpy(windows.data(), data, count * sizeof(::Window));
    return windows;
}

std::string titleOf(Display* display, ::Window window) {
    Atom type = None;
    int format = 0;
    unsigned long count = 0;
    unsigned long left = 0;
    unsigned char* data = nullptr;
    XGetWindowProperty(display, window, XInternAtom(display, "_NET_WM_NAME", False), 0, 1024, False,
                       XInternAtom(display, "UTF8_STRING", False), &type, &format, &count, &left, &data);
    const Owned<unsigned char> owner(data, XFree);
    return data != nullptr ? std::string(reinterpret_cast<char*>(data), count) : std::string();
}

std::optional<Window> geometry(Display* display, ::Window id) {
    XWindowAttributes attributes{};
    if (XGetWindowAttributes(display, id, &attributes) == 0 || attributes.map_state != IsViewable) {
        return std::nullopt;
    }
    int x = 0;
    int y = 0;
    ::Window child = None;
    XTranslateCoordinates(display, id, attributes.root, 0, 0, &x, &y, &child);
    return Window{id, x, y, attributes.width, attributes.height};
}

void collectChildren(Display* display, ::Window parent, std::vector<Window>& found) {
    ::Window root = None;
    ::Window above = None;
    ::Window* children = nullptr;
    unsigned int count = 0;
    if (XQueryTree(display, parent, &root, &above, &children, &count) == 0) {
        return;
    }
    const Owned<::Window> owner(children, XFree);
    for (unsigned int i = 0; i < count; ++i) {
        if (const auto window = geometry(display, children[i])) {
            found.push_back(*window);
        }
        collectChildren(display, children[i], found);
    }
}

std::vector<std::string> split(const std::string& chord) {
    std::vector<std::string> names;
    std::size_t begin = 0;
    for (std::size_t plus = chord.find('+'); plus != std::string::npos; plus = chord.find('+', begin)) {
        names.push_back(chord.substr(begin, plus - begin));
        begin = plus + 1;
    }
    names.push_back(chord.substr(begin));
    return names;
}

KeyCode keyCode(Display* display, const std::string& name) {
    static const std::array<std::pair<const char*, KeySym>, 4> modifiers = {
        {{"Alt", XK_Alt_L}, {"Control", XK_Control_L}, {"Shift", XK_Shift_L}, {"Super", XK_Super_L}}};
    for (const auto& [modifier, symbol] : modifiers) {
        if (name == modifier) {
            return XKeysymToKeycode(display, symbol);
        }
    }
    const KeySym symbol = XStringToKeysym(name.c_str());
    return symbol != NoSymbol ? XKeysymToKeycode(display, symbol) : KeyCode{0};
}

void clientMessage(Display* display, ::Window target, ::Window about, const char* type, std::array<long, 5> data,
                   long mask) {
    XEvent event{};
    event.xclient.type = ClientMessage;
    event.xclient.window = about;
    event.xclient.message_type = XInternAtom(display, type, False);
    event.xclient.format = 32;
    std::copy(data.begin(), data.end(), event.xclient.data.l);
    XSendEvent(display, target, False, mask, &event);
    XSync(display, False);
}

} // namespace

Picture::Colour Picture::at(int x, int y) const {
    const auto offset =
        4 * (static_cast<std::size_t>(y) * static_cast<std::size_t>(width) + static_cast<std::size_t>(x));
    return {pixels[offset], pixels[offset + 1], pixels[offset + 2]};
}

Picture::Colour Picture::around(int x, int y) const {
    Colour sum;
    int count = 0;
    for (int row = std::max(0, y - 2); row <= std::min(height - 1, y + 2); ++row) {
        for (int column = std::max(0, x - 2); column <= std::min(width - 1, x + 2); ++column) {
            const Colour one = at(column, row);
            sum = {sum.red + one.red, sum.green + one.green, sum.blue + one.blue};
            ++count;
        }
    }
    return {sum.red / count, sum.green / count, sum.blue / count};
}

std::unique_ptr<Screen> Screen::open() {
    Display* display = XOpenDisplay(nullptr);
    if (display == nullptr) {
        return nullptr;
    }
    int ignored = 0;
    if (XTestQueryExtension(display, &ignored, &ignored, &ignored, &ignored) == 0) {
        XCloseDisplay(display);
        return nullptr;
    }
    XSetErrorHandler(ignoreError);
    return std::unique_ptr<Screen>(new Screen(display)); // NOLINT: the constructor is private
}

Screen::Screen(_XDisplay* display) : m_display(display) {}

Screen::~Screen() {
    XCloseDisplay(m_display);
}

std::optional<Window> Screen::findWindow(const std::string& title) const {
    for (const ::Window id : windowList(m_display, "_NET_CLIENT_LIST")) {
        if (titleOf(m_display, id) == title) {
            return geometry(m_display, id);
        }
    }
    return std::nullopt;
}

int Screen::serverProcess() const {
    ucred peer{};
    socklen_t length = sizeof(peer);
    const int failed = getsockopt(ConnectionNumber(m_display), SOL_SOCKET, SO_PEERCRED, &peer, &length);
    return failed == 0 ? peer.pid : 0;
}

std::vector<std::string> Screen::titles() const {
    std::vector<std::string> found;
    for (const ::Window id : windowList(m_display, "_NET_CLIENT_LIST")) {
        found.push_back(titleOf(m_display, id));
    }
    return found;
}

std::optional<Window> Screen::largestChild(const Window& parent) const {
    std::vector<Window> found;
    collectChildren(m_display, parent.id, found);
    const auto largest = std::max_element(found.begin(), found.end(), [](const Window& a, const Window& b) {
        return a.width * a.height < b.width * b.height;
    });
    return largest != found.end() ? std::optional(*largest) : std::nullopt;
}

bool Screen::isActive(const Window& window) const {
    const auto active = windowList(m_display, "_NET_ACTIVE_WINDOW");
    return !active.empty() && active.front() == window.id;
}

std::optional<Window> Screen::refresh(const Window& window) const {
    return geometry(m_display, window.id);
}

Picture Screen::grab(const Window& area) const {
    XImage* image =
        XGetImage(m_display, DefaultRootWindow(m_display), area.x, area.y, static_cast<unsigned int>(area.width),
                  static_cast<unsigned int>(area.height), AllPlanes, ZPixmap);
    if (image == nullptr) {
        return {};
    }
    Picture picture{area.width, area.height, {}};
    picture.pixels.reserve(4 * static_cast<std::size_t>(area.width) * static_cast<std::size_t>(area.height));
    for (int y = 0; y < area.height; ++y) {
        for (int x = 0; x < area.width; ++x) {
            const unsigned long pixel = XGetPixel(image, x, y);
            picture.pixels.push_back(static_cast<std::uint8_t>(pixel >> 16));
            picture.pixels.push_back(static_cast<std::uint8_t>(pixel >> 8));
            picture.pixels.push_back(static_cast<std::uint8_t>(pixel));
            picture.pixels.push_back(255);
        }
    }
    XDestroyImage(image);
    return picture;
}

Picture Screen::grabAll() const {
    const int screen = DefaultScreen(m_display);
    return grab({0, 0, 0, DisplayWidth(m_display, screen), DisplayHeight(m_display, screen)});
}

bool Screen::key(const std::string& chord) {
    std::vector<KeyCode> codes;
    for (const auto& name : split(chord)) {
        codes.push_back(keyCode(m_display, name));
        if (codes.back() == 0) {
            return false;
        }
    }
    for (const KeyCode code : codes) {
        XTestFakeKeyEvent(m_display, code, True, CurrentTime);
    }
    for (auto code = codes.rbegin(); code != codes.rend(); ++code) {
        XTestFakeKeyEvent(m_display, *code, False, CurrentTime);
    }
    XSync(m_display, False);
    return true;
}

bool Screen::pressKey(const std::string& name) {
    const KeyCode code = keyCode(m_display, name);
    if (code != 0) {
        XTestFakeKeyEvent(m_display, code, True, CurrentTime);
        XSync(m_display, False);
    }
    return code != 0;
}

void Screen::releaseKey(const std::string& name) {
    if (const KeyCode code = keyCode(m_display, name); code != 0) {
        XTestFakeKeyEvent(m_display, code, False, CurrentTime);
        XSync(m_display, False);
    }
}

void Screen::moveTo(int x, int y) {
    XTestFakeMotionEvent(m_display, DefaultScreen(m_display), x, y, CurrentTime);
    XSync(m_display, False);
}

void Screen::press(int x, int y) {
    moveTo(x, y);
    XTestFakeButtonEvent(m_display, Button1, True, CurrentTime);
    XSync(m_display, False);
}

void Screen::release() {
    XTestFakeButtonEvent(m_display, Button1, False, CurrentTime);
    XSync(m_display, False);
}

void Screen::click(int x, int y) {
    press(x, y);
    release();
}

void Screen::resize(const Window& window, int width, int height) {
    XResizeWindow(m_display, window.id, static_cast<unsigned int>(width), static_cast<unsigned int>(height));
    XSync(m_display, False);
}

void Screen::move(const Window& window, int x, int y) {
    XMoveWindow(m_display, window.id, x, y);
    XSync(m_display, False);
}

void Screen::close(const Window& window) {
    clientMessage(m_display, DefaultRootWindow(m_display), window.id, "_NET_CLOSE_WINDOW", {CurrentTime, 2, 0, 0, 0},
                  SubstructureRedirectMask | SubstructureNotifyMask);
}

void Screen::activate(const Window& window) {
    clientMessage(m_display, DefaultRootWindow(m_display), window.id, "_NET_ACTIVE_WINDOW", {2, CurrentTime, 0, 0, 0},
                  SubstructureRedirectMask | SubstructureNotifyMask);
}

bool eventually(const std::function<bool()>& condition, std::chrono::milliseconds deadline) {
    const auto end = std::chrono::steady_clock::now() + deadline;
    while (!condition()) {
        if (std::chrono::steady_clock::now() >= end) {
            return false;
        }
        std::this_thread::sleep_for(kLookEvery);
    }
    return true;
}

} // namespace qivo::test
