#pragma once

#include "tests/runtime/RawServer.h"

#include <atomic>
#include <chrono>
#include <functional>
#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

namespace qivo::test {

/// One request as the camera received it.
struct CameraCall {
    std::string operation; ///< local name of the body's element, e.g. "ContinuousMove"
    std::string path;
    std::string header; ///< of HTTP, complete
    std::string body;
    std::chrono::steady_clock::time_point at;

    /// The value of the attribute or the text of the element that follows the given text; empty if it is not there.
    std::string after(const std::string& text) const;
};

/// A camera on loopback that moves, and that a test can make as odd as cameras are.
class ScriptedCamera {
  public:
    using Clock = std::chrono::steady_clock;
    /// Treats a request in its own way; false leaves it to the camera.
    using Quirk = std::function<bool(ScriptedCamera&, Connection&, const CameraCall&)>;
    /// Changes an answer's document.
    using Rewrite = std::function<std::string(std::string)>;

    struct Speed {
        float pan = 0;
        float tilt = 0;
        float zoom = 0;
        bool operator==(const Speed&) const = default;
    };

    /// Port 0: any. What is public below is set by `prepare`, before the first request.
    explicit ScriptedCamera(Quirk quirk = nullptr, int port = 0,
                            const std::function<void(ScriptedCamera&)>& prepare = nullptr);

    std::string url(const std::string& path = "/onvif/device_service", const std::string& login = "") const;
    int port() const { return m_server.port(); }

    /// Answers with a document; complete with header, fit to be sent.
    static std::string http(const std::string& xml, const std::string& status = "200 OK",
                            const std::string& lines = "");
    static std::string fault(const std::string& reason, const std::string& code = "ter:Action");
    static std::string envelope(const std::string& body);
    /// What the camera answers by itself; it does what it is asked.
    std::string answerTo(const CameraCall& call);

    Rewrite rewrite;
    bool chunked = false;
    bool ignoresRunOut = false; ///< moves on until it is told to stop
    bool namesPresets = true;
    std::string streamPath = "/live"; ///< of the profile that can be steered
    std::string servicesAt;           ///< scheme, host and port of the services; empty: where it was asked
    std::atomic<std::chrono::seconds> clockAhead{std::chrono::seconds(0)};

    /// Speeds by which it moves now.
    Speed speed() const;
    bool moves() const { return speed() != Speed{}; }
    /// Whether pan and tilt, or the zoom, are on their way to a preset, where they never arrive.
    bool glides() const;
    /// What another client does: gives a preset a name, new or not, or takes it away.
    void setPreset(const std::string& token, const std::string& name);
    void removePreset(const std::string& token);
    /// The tokens of the presets of that name.
    std::vector<std::string> presetsNamed(const std::string& name) const;
    std::vector<CameraCall> calls(const std::string& operation = "") const;
    int count(const std::string& operation) const { return static_cast<int>(calls(operation).size()); }
    /// The request for that operation of that number, from 0. One that has not come yet is waited for; the test fails
    /// and gets an empty one if it does not come.
    CameraCall call(const std::string& operation, std::size_t number = 0) const;
    /// The newest request for that operation; the first is waited for in the same way.
    CameraCall lastCall(const std::string& operation) const;
    std::string lastRecalled() const;

    /// Waits until the condition holds.
    static bool until(const std::function<bool()>& condition,
                      std::chrono::milliseconds limit = std::chrono::seconds(8));

  private:
    void serve(Connection& connection);
    void send(Connection& connection, const std::string& xml) const;
    std::string capabilities() const;
    std::string profiles() const;
    std::string presets() const;
    void move(const CameraCall& call);
    void stop(bool panTilt, bool zoom);
    std::string store(const CameraCall& call);
    std::string recall(const CameraCall& call);

    Quirk m_quirk;
    mutable std::mutex m_mutex; // protects the rest
    std::vector<CameraCall> m_calls;
    Speed m_speed;
    Clock::time_point m_runOut{};
    std::map<std::string, std::string> m_presets; // token, name
    std::string m_recalled;
    bool m_panTiltGlides = false;
    bool m_zoomGlides = false;

    RawServer m_server; // ends first: its threads use what is above
};

/// The parameter of an Authorization header or a challenge, without its quotes.
std::string parameterOf(const std::string& header, const std::string& name);

} // namespace qivo::test
