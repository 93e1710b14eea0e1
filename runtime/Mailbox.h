#pragma once

#include "runtime/CallerPace.h"
#include "runtime/Sound.h"
#include "runtime/SoundQueue.h"
#include "sdk/qivo.h"

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <mutex>
#include <utility>
#include <vector>

namespace qivo::runtime {

/// A picture in memory, readable for as long as the object lives.
class Picture {
  public:
    virtual ~Picture() = default;
    /// Describes the picture. `p_data` identifies it.
    virtual QIVOlib_video_frame_v2_t record() const = 0;
};

/// Between the threads that receive and the callers that capture: the pictures and the sound that wait, what is out of
/// both, and whether a status change waits.
///
/// A caller who keeps up is given every picture, the oldest first: what a busy machine or network has brought closer
/// together than it was sent is all shown then. For any other caller the newest picture wins.
///
/// Pictures in memory are bounded: those that wait, the ones that were captured until they have been given back and
/// ended, and the one that is being made. The maker asks for room first. It waits for a caller who keeps up to give a
/// picture back, for as long as such a one may take and the maker can wait; else its picture takes the place of the
/// oldest that waits. The lock is never held while a picture ends or is made, and none ends in a capture, so a capture
/// that does not wait never waits.
///
/// Thread: any.
class Mailbox {
  public:
    using Clock = std::chrono::steady_clock;

    /// Pictures in memory for one receiver.
    static constexpr std::size_t kPictures = 4;
    /// Pictures that can be out at a time: the rest is one that waits or is being made.
    static constexpr std::size_t kPicturesOut = kPictures - 1;

    /// A clock of the tests' own tells whether a caller keeps up.
    explicit Mailbox(std::function<Clock::time_point()> now = Clock::now) : m_now(std::move(now)) {}

    /// A status change waits to be captured. Several that nobody captured are one.
    void raiseStatus();

    /// A picture is about to be made; every call is followed by `offer` or `abandon`. May wait so long for a caller who
    /// keeps up.
    void makeRoom(Clock::duration patience);
    /// The picture that was made; it waits behind the others, or replaces them if the caller does not keep up.
    void offer(std::unique_ptr<Picture> picture);
    /// The picture could not be made.
    void abandon();
    /// Sound that was received; beyond what is held the oldest goes.
    void offer(std::unique_ptr<Sound> sound);
    /// Drops what waits: it belongs to a connection that has ended.
    void dropWaiting();

    /// A QIVOlib_frame_type; the status change comes first, then the picture, then the oldest sound. A null record
    /// means that its kind is not wanted. Answers "none" at the deadline, at the bound of what can be out, or once the
    /// mailbox is closed.
    int32_t capture(QIVOlib_video_frame_v2_t* video, QIVOlib_audio_frame_v2_t* audio, Clock::time_point deadline);
    /// Takes a captured picture back, known by its `p_data`; anything else is ignored.
    void giveBack(const void* data);
    /// Takes captured sound back, known by its `p_data`; anything else is ignored.
    void giveSoundBack(const void* data);
    /// Frames that wait: 0 to 4 pictures.
    QIVOlib_recv_queue_t waiting() const;

    /// Ends every wait; nothing is captured afterwards. Returns at once.
    void close();
    /// Ends every picture and all sound, what is out too. May take milliseconds.
    void drain();

  private:
    using Pictures = std::vector<std::unique_ptr<Picture>>;

    bool fullLocked() const;
    bool pictureReadyLocked() const;
    void lookLocked();
    bool readyLocked(bool wantsVideo, bool wantsAudio) const;

    const std::function<Clock::time_point()> m_now;
    mutable std::mutex m_mutex; // protects the rest
    std::condition_variable m_changed;
    std::deque<std::unique_ptr<Picture>> m_waiting; // the oldest first
    Pictures m_late;                                // waited too long, and are to be ended by the maker
    Pictures m_out;
    std::size_t m_making = 0;
    std::size_t m_ending = 0; // were given back
    CallerPace m_pace;
    int m_inside = 0; // callers who wait for a picture
    SoundQueue m_sounds;
    bool m_status = false;
    bool m_closed = false;
};

} // namespace qivo::runtime
