#pragma once

#include "runtime/Sound.h"
#include "runtime/SoundQueue.h"
#include "sdk/qivo.h"

#include <chrono>
#include <condition_variable>
#include <memory>
#include <mutex>
#include <vector>

namespace qivo::runtime {

/// A picture in memory, readable for as long as the object lives.
class Picture {
  public:
    virtual ~Picture() = default;
    /// Describes the picture. `p_data` identifies it.
    virtual QIVOlib_video_frame_v2_t record() const = 0;
};

/// Between the threads that receive and the callers that capture: the newest pictures, the sound that waits, what is
/// out of both, and whether a status change waits.
///
/// The newest picture wins. Only a caller who keeps up, who looks often and now and then finds none, is given the one
/// before it first: two that the network or a busy machine has brought closer together than they were sent are both
/// shown then. Who does not find none again soon after that is too slow for both, and is given the newest alone.
///
/// Pictures in memory are bounded: those that wait, the ones that were captured until they have been given back and
/// ended, and the one that is being made. The maker asks for room first, and its picture takes the place of one that
/// waits, the older one first, if there is no other. The lock is never held while a picture ends or is made, and none
/// ends in a capture, so a capture that does not wait never waits.
///
/// Thread: any.
class Mailbox {
  public:
    using Clock = std::chrono::steady_clock;

    /// Pictures in memory for one receiver.
    static constexpr std::size_t kPictures = 4;
    /// Pictures that can be out at a time: the rest is one that waits or is being made.
    static constexpr std::size_t kPicturesOut = kPictures - 1;
    /// How soon a caller who keeps up looks again.
    static constexpr std::chrono::milliseconds kLooksOften{100};
    /// How soon it finds none again.
    static constexpr std::chrono::milliseconds kCatchesUp{300};

    /// A status change waits to be captured. Several that nobody captured are one.
    void raiseStatus();

    /// A picture is about to be made; every call is followed by `offer` or `abandon`.
    void makeRoom();
    /// The picture that was made; it replaces one that waits, or has it wait before it.
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
    /// Frames that wait: 0 to 2 pictures.
    QIVOlib_recv_queue_t waiting() const;

    /// Ends every wait; nothing is captured afterwards. Returns at once.
    void close();
    /// Ends every picture and all sound, what is out too. May take milliseconds.
    void drain();

  private:
    bool pictureReadyLocked() const;
    void lookLocked(Clock::time_point now);
    bool readyLocked(bool wantsVideo, bool wantsAudio) const;

    mutable std::mutex m_mutex; // protects the rest
    std::condition_variable m_changed;
    std::unique_ptr<Picture> m_waiting;
    std::unique_ptr<Picture> m_before; // came before the one that waits, and waits too
    std::unique_ptr<Picture> m_late;   // waited too long, and is to be ended by the maker
    Clock::time_point m_looked{};      // when a caller last asked for pictures
    Clock::time_point m_foundNone{};   // when none waited for it
    bool m_keepsUp = false;
    std::vector<std::unique_ptr<Picture>> m_out;
    std::size_t m_making = 0;
    std::size_t m_ending = 0; // were given back
    SoundQueue m_sounds;
    bool m_status = false;
    bool m_closed = false;
};

} // namespace qivo::runtime
