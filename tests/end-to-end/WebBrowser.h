#pragma once

#include "tests/support/Process.h"

#include <QJsonArray>
#include <QJsonObject>
#include <QJsonValue>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace qivo::test {

/// What a page's canvas shows, scaled to 320 x 180: RGBA without padding; empty if it could not be read.
struct CanvasPicture {
    int width = 0;
    int height = 0;
    std::vector<std::uint8_t> pixels;
};

/// A headless Chromium with a user of its own in front of it, driven over WebDriver. A failure fails the test that
/// runs and answers with nothing.
///
/// Thread: one.
class WebBrowser {
  public:
    /// With the look of a phone: a small screen and fingers in place of a mouse. Null if it cannot be started.
    static std::unique_ptr<WebBrowser> start(bool phone = false);
    ~WebBrowser();
    WebBrowser(const WebBrowser&) = delete;
    WebBrowser& operator=(const WebBrowser&) = delete;

    void open(const std::string& address);
    void openTab();
    /// What a function body returns in the page.
    QJsonValue run(const std::string& script);
    std::string text(const std::string& selector);
    CanvasPicture canvas(const std::string& selector);

    /// Puts the mouse or the finger down on an element and leaves it there.
    void press(const std::string& selector);
    /// Moves what is down to another element.
    void dragTo(const std::string& selector);
    /// Lifts what is down, mouse, finger and keys.
    void releaseAll();
    void click(const std::string& selector);
    /// Presses a key, given as WebDriver writes it, and holds it.
    void holdKey(const std::string& key);
    void typeKey(const std::string& key);

    /// Every complaint on the page's console since the last time.
    std::vector<std::string> complaints();

  private:
    explicit WebBrowser(std::unique_ptr<Process> driver) : m_driver(std::move(driver)) {}
    bool begin(bool phone);
    QJsonValue command(const std::string& method, const std::string& path, const QJsonObject& body = {});
    QJsonObject find(const std::string& selector);
    void point(const QJsonArray& actions);
    void type(const QJsonArray& actions);

    std::unique_ptr<Process> m_driver;
    int m_port = 0;
    std::string m_session;
    std::string m_pointer = "mouse";
};

} // namespace qivo::test
