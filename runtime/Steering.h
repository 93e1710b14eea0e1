#pragma once

#include "runtime/OnvifProbe.h"
#include "runtime/PresetTable.h"
#include "runtime/PtzCommands.h"
#include "runtime/SoapClient.h"
#include "runtime/SteeringTarget.h"

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>

namespace qivo::runtime {

/// Steers the camera behind a source, once it has found that there is one.
///
/// All asking happens on a thread of its own, which outlives the object's users for as long as it takes to leave the
/// camera standing. Thread: any, for every public member; none waits for the camera.
class Steering : public std::enable_shared_from_this<Steering> {
  public:
    using Clock = std::chrono::steady_clock;

    /// The longest that a camera may take for one command, and for a stop.
    static constexpr std::chrono::milliseconds kCommandLimit{2000};
    static constexpr std::chrono::milliseconds kStopLimit{1000};
    /// The pauses between two attempts to find a camera that is announced and does not answer.
    static constexpr std::chrono::milliseconds kFirstPause{1000};
    static constexpr std::chrono::milliseconds kLongestPause{30000};

    /// Begins to ask. `changed` is called, from the steering's thread, when `isSupported` has another answer. Null if
    /// the system gives no thread.
    static std::shared_ptr<Steering> start(SteeringTarget target, std::function<void()> changed);

    /// For `start`, and for nobody else.
    Steering(SteeringTarget target, std::function<void()> changed);
    Steering(const Steering&) = delete;
    Steering& operator=(const Steering&) = delete;
    ~Steering();

    const SteeringTarget& target() const { return m_target; }
    /// Whether a camera has been found.
    bool isSupported() const;
    /// Whether it has been found that there is no camera, or the end has come.
    bool isOver() const { return m_over; }

    /// Whether the camera moves as it was told here, or has been told and has not answered.
    bool isBusy() const;
    /// Whether both have found the same camera, which each has. Its presets may differ.
    bool knowsTheSame(const Steering& other) const { return m_camera->isLike(*other.m_camera); }

    // Each answers whether the command was accepted for sending. Speeds are libqivo's.
    bool panTilt(float pan, float tilt);
    bool zoom(float speed);
    bool autoFocus();
    bool focus(float value);
    bool store(int preset);
    bool recall(int preset, float speed);

    /// No more commands; a camera that moves is stopped. Returns at once.
    void end();
    /// Waits until a camera that moved when `end` was called has been told to stop.
    void waitForEnd(Clock::time_point deadline);

  private:
    template <typename Able, typename Command>
    bool command(const Able& able, const Command& take);
    void run();
    bool find(SoapClient& client);
    void serve(SoapClient& client);
    void pause(Clock::time_point until);
    void ask(SoapClient& client, const PtzRequest& request);
    void askPreset(SoapClient& client, const PtzRequest& request);
    void usePreset(SoapClient& client, const PtzRequest& request, bool first);
    void askAnew(SoapClient& client, const PtzRequest& request, const std::string& token,
                 const SoapClient::Answer& refusal);
    void readPresets(SoapClient& client, const SoapClient::Answered& then);
    void post(SoapClient& client, const std::string& service, const SoapMessage& message, const PtzRequest& request);
    void done(const PtzRequest& request, const SoapClient::Answer& answer);
    bool stillWanted(const PtzRequest& request);
    void report(const std::string& reason) const;
    void wake() const;

    struct ContextRelease {
        void operator()(GMainContext* context) const;
    };

    const SteeringTarget m_target;
    const std::function<void()> m_changed;
    const std::unique_ptr<GMainContext, ContextRelease> m_context;
    std::atomic<bool> m_ended = false;
    std::atomic<bool> m_over = false;

    PresetTable m_presets; // Thread: the steering's own

    mutable std::mutex m_mutex; // protects the rest
    std::condition_variable m_finished;
    std::optional<OnvifCamera> m_camera; ///< set once
    PtzCommands m_commands;
};

} // namespace qivo::runtime
