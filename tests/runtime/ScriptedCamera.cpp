#include "tests/runtime/ScriptedCamera.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <ctime>
#include <sstream>
#include <thread>

namespace qivo::test {
namespace {

/// One request of HTTP; an empty operation at the end of the connection.
CameraCall readCall(Connection& connection) {
    CameraCall call;
    call.header = connection.request();
    call.at = std::chrono::steady_clock::now();
    const std::string mark = "Content-Length: ";
    const std::size_t at = call.header.find(mark);
    const std::size_t length =
        at == std::string::npos ? 0 : std::strtoul(call.header.c_str() + at + mark.size(), nullptr, 10);
    while (call.body.size() < length) {
        const std::string more = connection.some();
        if (more.empty()) {
            return {};
        }
        call.body += more;
    }
    std::istringstream(call.header.substr(0, call.header.find("\r\n"))) >> call.path >> call.path;
    const std::size_t body = call.body.find("Body>");
    if (body != std::string::npos) {
        const std::size_t name = call.body.find(':', body) + 1;
        call.operation = call.body.substr(name, call.body.find_first_of("> /", name) - name);
    }
    return call;
}

float numberOf(const std::string& text) {
    return std::strtof(text.c_str(), nullptr);
}

std::string clockNow(std::chrono::seconds ahead) {
    const std::time_t now = std::chrono::system_clock::to_time_t(std::chrono::system_clock::now() + ahead);
    std::tm parts{};
    gmtime_r(&now, &parts);
    std::ostringstream text;
    text << "<tds:SystemDateAndTime><tt:UTCDateTime><tt:Time><tt:Hour>" << parts.tm_hour << "</tt:Hour><tt:Minute>"
         << parts.tm_min << "</tt:Minute><tt:Second>" << parts.tm_sec << "</tt:Second></tt:Time><tt:Date><tt:Year>"
         << parts.tm_year + 1900 << "</tt:Year><tt:Month>" << parts.tm_mon + 1 << "</tt:Month><tt:Day>" << parts.tm_mday
         << "</tt:Day></tt:Date></tt:UTCDateTime></tds:SystemDateAndTime>";
    return text.str();
}

std::string response(const std::string& name, const std::string& content = "") {
    return ScriptedCamera::envelope("<" + name + "Response>" + content + "</" + name + "Response>");
}

} // namespace

std::string CameraCall::after(const std::string& text) const {
    const std::size_t found = body.find(text);
    if (found == std::string::npos) {
        return {};
    }
    const std::size_t begin = found + text.size();
    return body.substr(begin, body.find_first_of("\"<", begin) - begin);
}

ScriptedCamera::ScriptedCamera(Quirk quirk, int port, const std::function<void(ScriptedCamera&)>& prepare)
    : m_quirk(std::move(quirk)), m_server(port) {
    if (prepare) {
        prepare(*this);
    }
    m_server.setScript([this](Connection& connection) { serve(connection); });
}

std::string ScriptedCamera::url(const std::string& path, const std::string& login) const {
    return "http://" + (login.empty() ? "" : login + "@") + "127.0.0.1:" + std::to_string(port()) + path;
}

std::string ScriptedCamera::http(const std::string& xml, const std::string& status, const std::string& lines) {
    return "HTTP/1.1 " + status + "\r\nContent-Type: application/soap+xml\r\n" + lines +
           "Content-Length: " + std::to_string(xml.size()) + "\r\n\r\n" + xml;
}

std::string ScriptedCamera::envelope(const std::string& body) {
    return "<?xml version=\"1.0\"?><env:Envelope xmlns:env=\"http://www.w3.org/2003/05/soap-envelope\" "
           "xmlns:tds=\"http://www.onvif.org/ver10/device/wsdl\" xmlns:trt=\"http://www.onvif.org/ver10/media/wsdl\" "
           "xmlns:tptz=\"http://www.onvif.org/ver20/ptz/wsdl\" xmlns:timg=\"http://www.onvif.org/ver20/imaging/wsdl\" "
           "xmlns:tt=\"http://www.onvif.org/ver10/schema\"><env:Body>" +
           body + "</env:Body></env:Envelope>";
}

std::string ScriptedCamera::fault(const std::string& reason, const std::string& code) {
    return envelope("<env:Fault><env:Code><env:Value>env:Sender</env:Value><env:Subcode><env:Value>" + code +
                    "</env:Value></env:Subcode></env:Code><env:Reason><env:Text xml:lang=\"en\">" + reason +
                    "</env:Text></env:Reason></env:Fault>");
}

void ScriptedCamera::serve(Connection& connection) {
    for (;;) {
        const CameraCall call = readCall(connection);
        if (call.header.empty()) {
            return;
        }
        {
            const std::lock_guard guard(m_mutex);
            m_calls.push_back(call);
        }
        if (!m_quirk || !m_quirk(*this, connection, call)) {
            send(connection, answerTo(call));
        }
    }
}

void ScriptedCamera::send(Connection& connection, const std::string& xml) const {
    const std::string document = rewrite ? rewrite(xml) : xml;
    if (!chunked) {
        connection.send(http(document));
        return;
    }
    connection.send("HTTP/1.1 200 OK\r\nContent-Type: application/soap+xml\r\nTransfer-Encoding: chunked\r\n\r\n");
    for (std::size_t at = 0; at < document.size(); at += 100) {
        const std::string piece = document.substr(at, 100);
        std::ostringstream size;
        size << std::hex << piece.size();
        connection.send(size.str() + "\r\n" + piece + "\r\n");
    }
    connection.send("0\r\n\r\n");
}

std::string ScriptedCamera::capabilities() const {
    const std::string at = servicesAt.empty() ? url("") : servicesAt;
    return "<tds:Capabilities><tt:Imaging><tt:XAddr>" + at +
           "/onvif/imaging</tt:XAddr></tt:Imaging><tt:Media><tt:XAddr>" + at +
           "/onvif/media</tt:XAddr></tt:Media><tt:PTZ><tt:XAddr>" + at +
           "/onvif/ptz</tt:XAddr></tt:PTZ></tds:Capabilities>";
}

/// A fixed camera first, then the one that can be steered, each with a video source of its own.
std::string ScriptedCamera::profiles() const {
    return "<trt:Profiles token=\"fixed\"><tt:VideoSourceConfiguration><tt:SourceToken>source-0</tt:SourceToken>"
           "</tt:VideoSourceConfiguration></trt:Profiles><trt:Profiles token=\"dome\"><tt:VideoSourceConfiguration>"
           "<tt:SourceToken>source-1</tt:SourceToken></tt:VideoSourceConfiguration><tt:PTZConfiguration "
           "token=\"configuration\"><tt:NodeToken>node</tt:NodeToken></tt:PTZConfiguration></trt:Profiles>";
}

std::string ScriptedCamera::presets() const {
    const std::lock_guard guard(m_mutex);
    std::string text;
    for (const auto& [token, name] : m_presets) {
        text += "<tptz:Preset token=\"" + token + "\">" + (namesPresets ? "<tt:Name>" + name + "</tt:Name>" : "") +
                "</tptz:Preset>";
    }
    return text;
}

std::string ScriptedCamera::answerTo(const CameraCall& call) {
    if (call.operation == "GetSystemDateAndTime") {
        return response("tds:GetSystemDateAndTime", clockNow(clockAhead));
    }
    if (call.operation == "GetCapabilities") {
        return response("tds:GetCapabilities", capabilities());
    }
    if (call.operation == "GetProfiles") {
        return response("trt:GetProfiles", profiles());
    }
    if (call.operation == "GetStreamUri") {
        const bool dome = call.after("ProfileToken>") != "fixed";
        return response("trt:GetStreamUri", "<trt:MediaUri><tt:Uri>rtsp://10.0.0.9:554" +
                                                (dome ? streamPath : "/fixed") + "</tt:Uri></trt:MediaUri>");
    }
    if (call.operation == "GetNodes") {
        return response("tptz:GetNodes",
                        "<tptz:PTZNode token=\"node\"><tt:SupportedPTZSpaces><tt:ContinuousPanTiltVelocitySpace/>"
                        "<tt:ContinuousZoomVelocitySpace/><tt:PanTiltSpeedSpace/><tt:ZoomSpeedSpace/>"
                        "</tt:SupportedPTZSpaces></tptz:PTZNode>");
    }
    if (call.operation == "GetPresets") {
        return response("tptz:GetPresets", presets());
    }
    if (call.operation == "GetMoveOptions") {
        return response("timg:GetMoveOptions",
                        "<timg:MoveOptions><tt:Absolute><tt:Position><tt:Min>10</tt:Min><tt:Max>20</tt:Max>"
                        "</tt:Position></tt:Absolute></timg:MoveOptions>");
    }
    if (call.operation == "ContinuousMove") {
        move(call);
    } else if (call.operation == "Stop") {
        stop(call.after("PanTilt>") == "true", call.after("Zoom>") == "true");
    } else if (call.operation == "SetPreset") {
        return store(call);
    } else if (call.operation == "GotoPreset") {
        return recall(call);
    } else if (call.operation != "SetImagingSettings" && call.operation != "Move") {
        return fault("no such operation");
    }
    return response("tptz:" + call.operation);
}

void ScriptedCamera::move(const CameraCall& call) {
    const std::lock_guard guard(m_mutex);
    const std::string pan = call.after("PanTilt x=\"");
    if (!pan.empty()) {
        m_speed.pan = numberOf(pan);
        m_speed.tilt = numberOf(call.after("y=\""));
        m_panTiltGlides = false;
    }
    const std::string zoom = call.after("Zoom x=\"");
    if (!zoom.empty()) {
        m_speed.zoom = numberOf(zoom);
        m_zoomGlides = false;
    }
    m_runOut = Clock::now() + std::chrono::seconds(call.after("Timeout>") == "PT1S" ? 1 : 60);
}

void ScriptedCamera::stop(bool panTilt, bool zoom) {
    const std::lock_guard guard(m_mutex);
    m_speed = {panTilt ? 0 : m_speed.pan, panTilt ? 0 : m_speed.tilt, zoom ? 0 : m_speed.zoom};
    m_panTiltGlides = m_panTiltGlides && !panTilt;
    m_zoomGlides = m_zoomGlides && !zoom;
}

std::string ScriptedCamera::store(const CameraCall& call) {
    std::string token = call.after("PresetToken>");
    const std::string name = call.after("PresetName>");
    const std::lock_guard guard(m_mutex);
    const bool isTaken = std::any_of(m_presets.begin(), m_presets.end(), [&](const auto& preset) {
        return preset.first != token && preset.second == name;
    });
    if (isTaken) {
        return fault("another preset has this name", "ter:PresetExist");
    }
    if (!token.empty() && m_presets.count(token) == 0) {
        return fault("no such preset", "ter:NoToken");
    }
    if (token.empty()) {
        token = "slot" + std::string(1, static_cast<char>('A' + m_presets.size()));
    }
    m_presets[token] = name;
    return response("tptz:SetPreset", "<tptz:PresetToken>" + token + "</tptz:PresetToken>");
}

std::string ScriptedCamera::recall(const CameraCall& call) {
    const std::lock_guard guard(m_mutex);
    m_recalled = call.after("PresetToken>");
    if (m_presets.count(m_recalled) == 0) {
        return fault("no such preset", "ter:NoToken");
    }
    m_panTiltGlides = true;
    m_zoomGlides = true;
    return response("tptz:GotoPreset");
}

bool ScriptedCamera::glides() const {
    const std::lock_guard guard(m_mutex);
    return m_panTiltGlides || m_zoomGlides;
}

void ScriptedCamera::setPreset(const std::string& token, const std::string& name) {
    const std::lock_guard guard(m_mutex);
    m_presets[token] = name;
}

void ScriptedCamera::removePreset(const std::string& token) {
    const std::lock_guard guard(m_mutex);
    m_presets.erase(token);
}

std::vector<std::string> ScriptedCamera::presetsNamed(const std::string& name) const {
    const std::lock_guard guard(m_mutex);
    std::vector<std::string> tokens;
    for (const auto& preset : m_presets) {
        if (preset.second == name) {
            tokens.push_back(preset.first);
        }
    }
    return tokens;
}

ScriptedCamera::Speed ScriptedCamera::speed() const {
    const std::lock_guard guard(m_mutex);
    return ignoresRunOut || Clock::now() < m_runOut ? m_speed : Speed{};
}

std::vector<CameraCall> ScriptedCamera::calls(const std::string& operation) const {
    const std::lock_guard guard(m_mutex);
    std::vector<CameraCall> found;
    std::copy_if(m_calls.begin(), m_calls.end(), std::back_inserter(found),
                 [&](const CameraCall& call) { return operation.empty() || call.operation == operation; });
    return found;
}

CameraCall ScriptedCamera::call(const std::string& operation, std::size_t number) const {
    std::vector<CameraCall> found;
    until([&] { return (found = calls(operation)).size() > number; });
    if (found.size() <= number) {
        ADD_FAILURE() << operation << " was asked " << found.size() << " times";
        return {};
    }
    return found[number];
}

CameraCall ScriptedCamera::lastCall(const std::string& operation) const {
    return call(operation, std::max<std::size_t>(calls(operation).size(), 1) - 1);
}

std::string ScriptedCamera::lastRecalled() const {
    const std::lock_guard guard(m_mutex);
    return m_recalled;
}

bool ScriptedCamera::until(const std::function<bool()>& condition, std::chrono::milliseconds limit) {
    const auto deadline = Clock::now() + limit;
    while (!condition()) {
        if (Clock::now() >= deadline) {
            return false;
        }
        std::this_thread::sleep_for(std::chrono::milliseconds(2));
    }
    return true;
}

std::string parameterOf(const std::string& header, const std::string& name) {
    const std::size_t at = header.find(name + "=");
    if (at == std::string::npos) {
        return {};
    }
    std::size_t begin = at + name.size() + 1;
    const bool quoted = header[begin] == '"';
    begin += quoted ? 1 : 0;
    return header.substr(begin, header.find_first_of(quoted ? "\"" : ", \r", begin) - begin);
}

} // namespace qivo::test
