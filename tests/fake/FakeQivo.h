#pragma once

#include "sdk/qivo.h"

#include <deque>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

namespace qivo::test {

/// A scripted libqivo. A test that links it decides what every operation answers and reads back which operations were
/// called, with which arguments, in which order. It also keeps account of what is out: finders, receivers, frames and
/// strings, and notes every misuse (freed twice, used after destruction).
///
/// Thread: any; everything public is guarded by one lock.
class FakeQivo {
  public:
    /// One answer to `QIVOlib_recv_capture_v2`. Pixels or samples are owned by the script until they are captured.
    struct Capture {
        int32_t type = QIVOlib_frame_type_none;
        QIVOlib_video_frame_v2_t video{};
        QIVOlib_audio_frame_v2_t audio{};
        std::vector<uint8_t> pixels;
        std::vector<float> samples;
    };

    /// What is left out is null in the list.
    struct Source {
        std::optional<std::string> name;
        std::optional<std::string> url;
    };

    /// The fake that the C functions talk to.
    static FakeQivo& instance();

    /// Forgets calls, script and account. Call it first in every test.
    void reset();

    // --- The script.
    void setInitializes(bool yes);
    void setFinderCreates(bool yes);
    void setReceiverCreates(bool yes);
    /// The finder's next wait reports a change, and the list is this one from then on.
    void setSources(std::vector<Source> sources);
    /// What the next capture on any receiver answers; an exhausted script answers "none".
    void addCapture(Capture capture);
    void addStatusChange();
    /// A video frame of one colour; `stride` 0 means 4 x width.
    void addVideo(int32_t width, int32_t height, uint32_t rgba, float aspect, int32_t stride = 0);
    /// An empty optional address means none (null).
    void setWebControl(const char* address);
    void setPtzSupported(bool yes);
    void setQueue(QIVOlib_recv_queue_t queue);
    /// Called, without the fake's lock, at the start of every operation with its line in `calls`.
    void setHook(std::function<void(const std::string&)> hook);

    // --- What happened.
    /// Every call as a line: the operation's name without the prefix, then its arguments, as in
    /// `recv_create_v3(name=A, url=null, color=2, bandwidth=100, fields=0, receiver=null)` or
    /// `recv_capture_v2(r1, video, timeout=0) -> 100`. Handles are f1, f2, ... and r1, r2, ... in order of creation.
    std::vector<std::string> calls() const;
    /// The same, and forgets them.
    std::vector<std::string> takeCalls();
    /// Lines that begin with `prefix`.
    std::vector<std::string> callsOf(const std::string& prefix) const;
    int openFinders() const;
    int openReceivers() const;
    int framesOut() const;
    int stringsOut() const;
    /// Misuse seen so far; empty if all went by the rules.
    std::vector<std::string> misuse() const;
    /// The value of the last focus command, whose line is rounded; 0 if there was none.
    float lastFocus() const;
    /// The `p_data` of captured frames that are still out.
    std::vector<const void*> framesOutData() const;

    struct State;
    State& state() { return *m_state; }

  private:
    FakeQivo();
    ~FakeQivo();
    std::unique_ptr<State> m_state;
};

} // namespace qivo::test
