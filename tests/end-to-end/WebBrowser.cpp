#include "tests/end-to-end/WebBrowser.h"

#include "tests/support/Screen.h"
#include "tests/tools/HttpClient.h"

#include <QByteArray>
#include <QJsonDocument>
#include <QString>
#include <cstdlib>
#include <gtest/gtest.h>

namespace qivo::test {
namespace {

using namespace std::chrono_literals;

constexpr auto answerTime = 40s;

QString qt(const std::string& text) {
    return QString::fromStdString(text);
}

QJsonObject chromeOptions(bool phone) {
    // Under the launcher's home, which goes away with it.
    const std::string profile = std::string(std::getenv("HOME")) + "/chromium-" + (phone ? "phone" : "desktop");
    QJsonArray arguments{"--headless",
                         "--no-sandbox",
                         "--disable-gpu",
                         "--disable-quic",
                         "--no-first-run",
                         "--disable-background-networking",
                         "--disable-component-update",
                         "--disable-sync",
                         "--disable-dev-shm-usage",
                         qt("--user-data-dir=" + profile)};
    arguments.append(phone ? "--window-size=500,900" : "--window-size=1280,900");
    QJsonObject options{{"args", arguments}};
    if (phone) {
        const QJsonObject screen{{"width", 390}, {"height", 844}, {"pixelRatio", 1.0}, {"touch", true}};
        options.insert("mobileEmulation", QJsonObject{{"deviceMetrics", screen}});
    }
    return options;
}

} // namespace

std::unique_ptr<WebBrowser> WebBrowser::start(bool phone) {
    auto driver = Process::start({"/bin/sh", "-c", "exec chromedriver --port=0 2>&1"});
    if (!driver || !driver->waitForOutput("started successfully on port ")) {
        return nullptr;
    }
    auto browser = std::unique_ptr<WebBrowser>(new WebBrowser(std::move(driver)));
    return browser->begin(phone) ? std::move(browser) : nullptr;
}

bool WebBrowser::begin(bool phone) {
    const std::string marker = "started successfully on port ";
    const std::string output = m_driver->output();
    m_port = std::atoi(output.c_str() + output.find(marker) + marker.size());
    m_pointer = phone ? "touch" : "mouse";
    const QJsonObject always{{"goog:chromeOptions", chromeOptions(phone)},
                             {"goog:loggingPrefs", QJsonObject{{"browser", "ALL"}}}};
    const QJsonValue session = command("POST", "/session", {{"capabilities", QJsonObject{{"alwaysMatch", always}}}});
    m_session = "/session/" + session["sessionId"].toString().toStdString();
    return session["sessionId"].isString();
}

WebBrowser::~WebBrowser() {
    if (!m_session.empty()) {
        command("DELETE", m_session); // ends Chromium
    }
    m_driver->signal(SIGTERM);
    m_driver->wait(5s);
}

QJsonValue WebBrowser::command(const std::string& method, const std::string& path, const QJsonObject& body) {
    const std::string json = method == "POST" ? QJsonDocument(body).toJson(QJsonDocument::Compact).toStdString() : "";
    RawConnection connection(m_port);
    connection.send(method + " " + path + " HTTP/1.1\r\nHost: 127.0.0.1:" + std::to_string(m_port) +
                    "\r\nContent-Type: application/json\r\nContent-Length: " + std::to_string(json.size()) +
                    "\r\n\r\n" + json);
    const std::string head = connection.readUntil("\r\n\r\n", answerTime);
    const QString lower = qt(head).toLower();
    const auto length = lower.section("content-length:", 1, 1).section("\r\n", 0, 0).trimmed().toULongLong();
    const std::string answer = connection.read(length, answerTime);
    if (statusOf(head) != 200) {
        ADD_FAILURE() << method << " " << path << ": " << head << answer.substr(0, 600);
        return {};
    }
    return QJsonDocument::fromJson(QByteArray::fromStdString(answer)).object().value("value");
}

void WebBrowser::open(const std::string& address) {
    command("POST", m_session + "/url", {{"url", qt(address)}});
}

void WebBrowser::openTab() {
    const QJsonValue tab = command("POST", m_session + "/window/new", {{"type", "tab"}});
    command("POST", m_session + "/window", {{"handle", tab["handle"]}});
}

QJsonValue WebBrowser::run(const std::string& script) {
    return command("POST", m_session + "/execute/sync", {{"script", qt(script)}, {"args", QJsonArray()}});
}

std::string WebBrowser::text(const std::string& selector) {
    return run("return document.querySelector('" + selector + "').textContent").toString().toStdString();
}

CanvasPicture WebBrowser::canvas(const std::string& selector) {
    // Small, and as text of which each character is a byte: a large array takes so long that a camera is at its end.
    const QJsonValue seen = run("const shown = document.querySelector('" + selector +
                                "'); const canvas = new OffscreenCanvas(320, 180);"
                                "const context = canvas.getContext('2d', {willReadFrequently: true});"
                                "context.imageSmoothingQuality = 'medium'; context.drawImage(shown, 0, 0, 320, 180);"
                                "const bytes = context.getImageData(0, 0, 320, 180).data; let text = '';"
                                "for (let i = 0; i < bytes.length; i += 8192)"
                                "  text += String.fromCharCode(...bytes.subarray(i, i + 8192));"
                                "return {width: 320, height: 180, pixels: btoa(text)};");
    const QByteArray bytes = QByteArray::fromBase64(seen["pixels"].toString().toLatin1());
    return {seen["width"].toInt(), seen["height"].toInt(), {bytes.begin(), bytes.end()}};
}

QJsonObject WebBrowser::find(const std::string& selector) {
    return command("POST", m_session + "/element", {{"using", "css selector"}, {"value", qt(selector)}}).toObject();
}

void WebBrowser::point(const QJsonArray& actions) {
    const QJsonObject source{{"type", "pointer"},
                             {"id", "pointer"},
                             {"parameters", QJsonObject{{"pointerType", qt(m_pointer)}}},
                             {"actions", actions}};
    command("POST", m_session + "/actions", {{"actions", QJsonArray{source}}});
}

void WebBrowser::type(const QJsonArray& actions) {
    const QJsonObject source{{"type", "key"}, {"id", "keys"}, {"actions", actions}};
    command("POST", m_session + "/actions", {{"actions", QJsonArray{source}}});
}

void WebBrowser::press(const std::string& selector) {
    dragTo(selector);
    point({QJsonObject{{"type", "pointerDown"}, {"button", 0}}});
}

void WebBrowser::dragTo(const std::string& selector) {
    point({QJsonObject{{"type", "pointerMove"}, {"origin", find(selector)}, {"x", 0}, {"y", 0}, {"duration", 0}}});
}

void WebBrowser::releaseAll() {
    command("DELETE", m_session + "/actions");
}

void WebBrowser::click(const std::string& selector) {
    point({QJsonObject{{"type", "pointerMove"}, {"origin", find(selector)}, {"x", 0}, {"y", 0}, {"duration", 0}},
           QJsonObject{{"type", "pointerDown"}, {"button", 0}}, QJsonObject{{"type", "pause"}, {"duration", 40}},
           QJsonObject{{"type", "pointerUp"}, {"button", 0}}});
}

void WebBrowser::holdKey(const std::string& key) {
    type({QJsonObject{{"type", "keyDown"}, {"value", qt(key)}}});
}

void WebBrowser::typeKey(const std::string& key) {
    type({QJsonObject{{"type", "keyDown"}, {"value", qt(key)}}, QJsonObject{{"type", "keyUp"}, {"value", qt(key)}}});
}

std::vector<std::string> WebBrowser::complaints() {
    std::vector<std::string> texts;
    for (const QJsonValue& entry : command("POST", m_session + "/se/log", {{"type", "browser"}}).toArray()) {
        const QString level = entry["level"].toString();
        if (level == "SEVERE" || level == "WARNING") {
            texts.push_back(entry["message"].toString().toStdString());
        }
    }
    return texts;
}

} // namespace qivo::test
