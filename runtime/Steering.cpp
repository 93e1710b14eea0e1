#include "runtime/Steering.h"

#include "runtime/BackgroundThreads.h"
#include "runtime/Log.h"
#include "runtime/LogOnce.h"
#include "runtime/OnvifMessages.h"
#include "runtime/SteeringExit.h"

#include <algorithm>
#include <glib.h>
#include <utility>
#include <vector>

namespace qivo::runtime {
namespace {

using Kind = PtzRequest::Kind;

/// ONVIF pans right with a positive speed.
onvif::Velocity velocityOf(unsigned axes, const PtzSpeed& speed) {
    onvif::Velocity velocity;
    if ((axes & kPanTiltAxes) != 0) {
        velocity.panTilt = onvif::Velocity::PanTilt{-speed.pan, speed.tilt};
    }
    if ((axes & kZoomAxis) != 0) {
        velocity.zoom = speed.zoom;
    }
    return velocity;
}

/// ONVIF's positions grow with the distance, as its speeds of the focus are positive towards what is far.
float focusPosition(const onvif::Range& range, float value) {
    return range.most - value * (range.most - range.least);
}

SoapMessage messageOf(const OnvifCamera& camera, const PtzRequest& request) {
    switch (request.kind) {
    case Kind::stop:
        return onvif::stop(camera.profile, (request.axes & kPanTiltAxes) != 0, (request.axes & kZoomAxis) != 0);
    case Kind::autoFocus:
    case Kind::manualFocus:
        return onvif::setAutoFocus(camera.videoSource, request.kind == Kind::autoFocus);
    case Kind::focus:
        return onvif::moveFocus(camera.videoSource, focusPosition(*camera.focus, request.value));
    default:
        return onvif::continuousMove(camera.profile, velocityOf(request.axes | request.moving, request.speed),
                                     static_cast<int>(PtzCommands::kRunOut.count()));
    }
}

bool isFocus(Kind kind) {
    return kind == Kind::autoFocus || kind == Kind::manualFocus || kind == Kind::focus;
}

std::chrono::milliseconds limitOf(Kind kind) {
    return kind == Kind::stop || kind == Kind::halt ? Steering::kStopLimit : Steering::kCommandLimit;
}

std::string noPreset(const PtzRequest& request) {
    return "it has no preset " + std::to_string(request.preset);
}

} // namespace

void Steering::ContextRelease::operator()(GMainContext* context) const {
    g_main_context_unref(context);
}

std::shared_ptr<Steering> Steering::start(SteeringTarget target, std::function<void()> changed) {
    auto steering = std::make_shared<Steering>(std::move(target), std::move(changed));
    if (!BackgroundThreads::start([steering] { steering->run(); })) {
        log("no steering: the system gives no thread");
        return nullptr;
    }
    steeringBegan(steering);
    return steering;
}

Steering::Steering(SteeringTarget target, std::function<void()> changed)
    : m_target(std::move(target)), m_changed(std::move(changed)), m_context(g_main_context_new()) {}

Steering::~Steering() = default;

bool Steering::isSupported() const {
    const std::lock_guard guard(m_mutex);
    return m_camera && !m_ended;
}

bool Steering::isBusy() const {
    const std::lock_guard guard(m_mutex);
    return m_commands.busy(Clock::now());
}

/// `able` tells whether the camera can do it at all.
template <typename Able, typename Command>
bool Steering::command(const Able& able, const Command& take) {
    {
        const std::lock_guard guard(m_mutex);
        if (!m_camera || !able(*m_camera) || !take(m_commands)) {
            return false;
        }
    }
    wake();
    return true;
}

bool Steering::panTilt(float pan, float tilt) {
    return command([](const OnvifCamera& camera) { return camera.node.panTilt; },
                   [&](PtzCommands& commands) { return commands.move(pan, tilt); });
}

bool Steering::zoom(float speed) {
    return command([](const OnvifCamera& camera) { return camera.node.zoom; },
                   [&](PtzCommands& commands) { return commands.zoom(speed); });
}

bool Steering::autoFocus() {
    return command([](const OnvifCamera& camera) { return camera.imaging; },
                   [](PtzCommands& commands) { return commands.autoFocus(); });
}

bool Steering::focus(float value) {
    return command([](const OnvifCamera& camera) { return camera.focus.has_value(); },
                   [&](PtzCommands& commands) { return commands.focus(value); });
}

bool Steering::store(int preset) {
    return command([](const OnvifCamera&) { return true; },
                   [&](PtzCommands& commands) { return commands.store(preset); });
}

bool Steering::recall(int preset, float speed) {
    return command([](const OnvifCamera&) { return true; },
                   [&](PtzCommands& commands) { return commands.recall(preset, speed); });
}

void Steering::end() {
    {
        const std::lock_guard guard(m_mutex);
        m_commands.end(Clock::now());
        m_ended = true;
    }
    wake();
}

void Steering::waitForEnd(Clock::time_point deadline) {
    std::unique_lock lock(m_mutex);
    m_finished.wait_until(lock, deadline, [this] { return m_over || m_commands.finished(Clock::now()); });
}

void Steering::wake() const {
    g_main_context_wakeup(m_context.get());
}

void Steering::run() {
    g_main_context_push_thread_default(m_context.get());
    {
        SoapClient client(m_context.get(), m_target);
        if (find(client)) {
            m_changed();
            serve(client);
        }
    }
    g_main_context_pop_thread_default(m_context.get());
    {
        const std::lock_guard guard(m_mutex);
        m_over = true;
    }
    m_finished.notify_all();
}

/// Asks until there is an answer; one that is not announced, only once. False if there is no camera.
bool Steering::find(SoapClient& client) {
    std::chrono::milliseconds wait = kFirstPause;
    while (!m_ended) {
        OnvifProbe::Result result = OnvifProbe(client, m_target, [this] { return m_ended.load(); }).run();
        if (result.camera) {
            m_presets.read(result.camera->presets);
            const std::lock_guard guard(m_mutex);
            m_camera = std::move(result.camera);
            return true;
        }
        if (m_target.announced && !m_ended) {
            report(result.reason);
        }
        if (result.answered || !m_target.announced) {
            return false;
        }
        const Clock::time_point next = Clock::now() + wait;
        while (!m_ended && Clock::now() < next) {
            pause(next);
        }
        wait = std::min(2 * wait, kLongestPause);
    }
    return false;
}

/// Iterates the context until something has happened or the time has come.
void Steering::pause(Clock::time_point until) {
    constexpr std::chrono::milliseconds kLongest{60000};
    const auto left = std::chrono::ceil<std::chrono::milliseconds>(until - std::min(until, Clock::now()));
    GSource* timer = g_timeout_source_new(static_cast<guint>(std::min(left, kLongest).count()));
    g_source_set_callback(
        timer, [](gpointer) { return static_cast<gboolean>(G_SOURCE_REMOVE); }, nullptr, nullptr);
    g_source_attach(timer, m_context.get());
    g_main_context_iteration(m_context.get(), TRUE);
    g_source_destroy(timer);
    g_source_unref(timer);
}

void Steering::serve(SoapClient& client) {
    for (;;) {
        std::vector<PtzRequest> requests;
        Clock::time_point look;
        {
            const std::lock_guard guard(m_mutex);
            const Clock::time_point now = Clock::now();
            while (auto request = m_commands.next(now)) {
                requests.push_back(*request);
            }
            look = m_commands.nextLook();
            if (m_commands.finished(now)) {
                return;
            }
        }
        for (const PtzRequest& request : requests) {
            ask(client, request);
        }
        pause(look);
    }
}

void Steering::ask(SoapClient& client, const PtzRequest& request) {
    if (request.kind == Kind::recall || request.kind == Kind::store) {
        askPreset(client, request);
    } else {
        // The camera is set once and before the first command, so reading it here needs no lock.
        const onvif::Services& services = m_camera->services;
        post(client, isFocus(request.kind) ? services.imaging : services.ptz, messageOf(*m_camera, request), request);
    }
}

void Steering::post(SoapClient& client, const std::string& service, const SoapMessage& message,
                    const PtzRequest& request) {
    client.post(service, message, limitOf(request.kind),
                [this, request](const SoapClient::Answer& answer) { done(request, answer); });
}

/// Asks for the presets again if the number is not known: somebody else may have stored it.
void Steering::askPreset(SoapClient& client, const PtzRequest& request) {
    if (!m_presets.tokenOf(request.preset).empty()) {
        usePreset(client, request, true);
        return;
    }
    readPresets(client, [this, &client, request](SoapClient::Answer answer) {
        const bool isThere = !m_presets.tokenOf(request.preset).empty();
        if (stillWanted(request) && (isThere || request.kind == Kind::store)) {
            usePreset(client, request, true);
            return;
        }
        if (answer.accepted() && !isThere) {
            answer.failure = noPreset(request);
        }
        done(request, answer);
    });
}

void Steering::usePreset(SoapClient& client, const PtzRequest& request, bool first) {
    const std::string token = m_presets.tokenOf(request.preset);
    const bool stores = request.kind == Kind::store;
    const auto speed = m_camera->node.speeds ? std::optional(request.value) : std::nullopt;
    const SoapMessage message = stores ? onvif::setPreset(m_camera->profile, PresetTable::nameOf(request.preset), token)
                                       : onvif::gotoPreset(m_camera->profile, token, speed);
    client.post(m_camera->services.ptz, message, kCommandLimit,
                [this, &client, request, token, stores, first](const SoapClient::Answer& answer) {
                    if (stores && answer.accepted() && answer.reply) {
                        m_presets.stored(request.preset, onvif::presetOf(*answer.reply));
                    }
                    if (!answer.accepted() && answer.status != 0 && first && stillWanted(request)) {
                        askAnew(client, request, token, answer);
                    } else {
                        done(request, answer);
                    }
                });
}

/// Once more where the camera means another preset by now: others take presets away and store them again.
void Steering::askAnew(SoapClient& client, const PtzRequest& request, const std::string& token,
                       const SoapClient::Answer& refusal) {
    readPresets(client, [this, &client, request, token, failure = refusal.failure](SoapClient::Answer answer) {
        const bool isKnown = answer.status != 0; // where the camera says nothing, the preset may be there
        if (isKnown && (!answer.accepted() || !m_presets.lists(token))) {
            m_presets.forget(token);
        }
        const std::string other = m_presets.tokenOf(request.preset);
        const bool canBe = !other.empty() || request.kind == Kind::store;
        if (other != token && canBe && stillWanted(request)) {
            usePreset(client, request, false);
            return;
        }
        answer.failure = canBe ? failure : noPreset(request);
        done(request, answer);
    });
}

void Steering::readPresets(SoapClient& client, const SoapClient::Answered& then) {
    client.post(m_camera->services.ptz, onvif::getPresets(m_camera->profile), kCommandLimit,
                [this, then](SoapClient::Answer answer) {
                    if (answer.reply && answer.accepted()) {
                        m_presets.read(onvif::presetsOf(*answer.reply));
                    }
                    then(std::move(answer));
                });
}

bool Steering::stillWanted(const PtzRequest& request) {
    const std::lock_guard guard(m_mutex);
    return m_commands.stillWanted(request.id);
}

void Steering::done(const PtzRequest& request, const SoapClient::Answer& answer) {
    if (!answer.accepted()) {
        report(answer.failure);
    }
    const bool mayBeDone = request.kind == Kind::recall && answer.status == 0;
    {
        const std::lock_guard guard(m_mutex);
        m_commands.done(request.id, answer.accepted() || mayBeDone, Clock::now());
    }
    m_finished.notify_all();
}

void Steering::report(const std::string& reason) const {
    logOnce("steering by " + m_target.device + ": " + reason);
}

} // namespace qivo::runtime
