#pragma once

#include "tools/publish/DueSound.h"
#include "tools/publish/NeededElement.h"
#include "tools/publish/PictureSource.h"
#include "tools/publish/Sound.h"
#include "tools/publish/SoundCushion.h"

#include <array>
#include <chrono>
#include <condition_variable>
#include <functional>
#include <gst/app/gstappsink.h>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <vector>

namespace qivo {

enum class InputKind { file, stillPicture, device, stream };

/** Something that pictures are taken from. */
struct InputPlace {
    InputKind kind = InputKind::file;
    std::string location; ///< a path or an address
    bool sound = false;   ///< it has some, or an address may have

    /** The location without a password. */
    [[nodiscard]] std::string shown() const;
};

/** What an --input means, without looking. */
[[nodiscard]] InputPlace placeOf(const std::string& input);

/** Looks whether pictures can be taken from there: a file is opened and its video found, a device must exist; an
 * address is not tried, it may come up later. Tells still pictures from films, and whether there is sound, in `place`.
 * Empty, or one line that says what is wrong. Takes seconds at most; GStreamer must be initialised. */
[[nodiscard]] std::string inputProblem(InputPlace& place);

/** What a capture device is asked for, in the order of preference: pictures of the wanted size and rate, raw or as
 *  JPEG, then faster ones, then those of another size, then any; without either H.264, H.265, an MPEG transport stream
 *  or DV as it comes. As gst-launch takes it. */
[[nodiscard]] std::string captureCaps(const PictureFormat& wanted);

/** The elements that such an input needs, each with the Debian package that brings it. */
[[nodiscard]] std::vector<NeededElement> elementsFor(InputKind kind);

/** A file, device or stream, opened while at least one of its two streams is watched: a device can be opened only once.
 *  A file is played in a loop at its own speed; the others are reopened whenever they end or fail. What a file brings
 * was taken when it was due at that speed, in picture and sound alike; what the others bring, when it came. */
class Input {
  public:
    enum class Branch { full, low };

    /** After this time without a picture a stream shows that there is none. */
    static constexpr std::chrono::milliseconds patience{1000};

    /** `say` is called, on any thread, with lines for the user. */
    using Say = std::function<void(const std::string&)>;

    /** Without a sound format the input's sound is left alone. */
    Input(InputPlace place, const PictureFormat& full, const PictureFormat& low, std::optional<SoundFormat> sound,
          Say say);
    ~Input();
    Input(const Input&) = delete;
    Input& operator=(const Input&) = delete;

    /** Pictures of one branch in its format; `look` is shown while there are none. The source keeps the input alive. */
    [[nodiscard]] static std::unique_ptr<PictureSource> watch(const std::shared_ptr<Input>& input, Branch branch,
                                                              const TestPictureLook& look);

    /** The input's sound in its format, for one branch; silence while there is none. It does not open the input: only
     *  pictures do. */
    [[nodiscard]] static std::unique_ptr<SoundSource> listen(const std::shared_ptr<Input>& input, Branch branch);

  private:
    friend class InputPictureSource;
    friend class InputSoundSource;

    // The newest picture of a branch; it replaces one that was not taken.
    struct Slot {
        Input* owner = nullptr;
        PictureFormat format;
        int watchers = 0;                 // under m_mutex
        Picture newest;                   // under m_mutex
        int listeners = 0;                // under m_mutex
        std::optional<DueSound> recorded; // under m_mutex; the sound of a recorded input
        std::optional<SoundCushion> live; // under m_mutex; and of another
    };

    void watched(Branch branch);
    void unwatched(Branch branch);
    void run();
    void playOnce();
    void report(GstMessage* message);
    bool handle(GstElement* pipeline, GstMessage* message);
    bool pauseFor(std::chrono::milliseconds time);
    bool stopping();
    bool stalled(std::chrono::steady_clock::time_point opened);
    [[nodiscard]] Object<GstElement> build();
    void connect(GstElement* pipeline, const char* sinkName, Slot& slot);
    [[nodiscard]] std::string description() const;
    [[nodiscard]] Object<GstElement> buildSound() const;
    static void onPadAdded(GstElement* decoder, GstPad* pad, gpointer input);
    static GstFlowReturn onSound(GstAppSink* sink, gpointer input);
    static GstFlowReturn onSample(GstAppSink* sink, gpointer slot);
    static GstPadProbeReturn onBuffer(GstPad* pad, GstPadProbeInfo* info, gpointer slot);

    const InputPlace m_place;
    const std::optional<SoundFormat> m_sound;
    const Say m_say;
    std::array<Slot, 2> m_slots;
    std::mutex m_running; // held while the thread is started or ended
    std::thread m_thread; // under m_running
    std::mutex m_mutex;
    std::condition_variable m_changed;
    std::string m_reported;                              // under m_mutex
    bool m_stop = true;                                  // under m_mutex
    std::chrono::steady_clock::time_point m_lastPicture; // under m_mutex
};

} // namespace qivo
