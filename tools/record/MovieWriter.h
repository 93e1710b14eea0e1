#pragma once

#include "tools/record/Fragmenter.h"
#include "tools/record/MoviePlace.h"

#include <atomic>
#include <condition_variable>
#include <deque>
#include <mutex>
#include <string>
#include <thread>
#include <variant>

namespace qivo::record {

/** Now, on the clock that everything is timed by. */
[[nodiscard]] Nanoseconds steadyNow();

/** Writes the movie on a thread of its own, so that nothing that receives waits for the disk. The file is made when
 * there is something to write. Thread: any, each operation. */
class MovieWriter {
  public:
    /** Most bytes that wait to be written. */
    static constexpr std::size_t mostWaiting = std::size_t{64} << 20U;

    explicit MovieWriter(MoviePlace place);
    ~MovieWriter();
    MovieWriter(const MovieWriter&) = delete;
    MovieWriter& operator=(const MovieWriter&) = delete;

    /** What holds for all pictures; before the first. */
    void setPicture(PictureFormat format);
    /** Waits while too much waits to be written. */
    void add(CodedPicture picture);
    /** False if too much waits to be written; then the piece is lost. */
    bool add(SoundPiece piece, const SoundFormat& format);
    /** Writes what is left and finishes the movie. Nothing can be added after. */
    void finish();

    struct Status {
        std::uint64_t pictures = 0; ///< written
        std::uint64_t bytes = 0;    ///< of the file
        Nanoseconds length{};       ///< of what has been put on the time line
        bool diskIsSlow = false;    ///< a single writing has taken long and goes on
        std::string problem;        ///< why writing has ended; empty if it has not
        std::string remark;         ///< in what the finished movie is not like others; empty if in nothing
    };
    [[nodiscard]] Status status() const;

  private:
    struct SoundItem {
        SoundPiece piece;
        SoundFormat format;
    };
    using Item = std::variant<PictureFormat, CodedPicture, SoundItem>;

    void run();
    void take(Item item);
    void write(const Fragment& fragment);
    void finishFile();
    [[nodiscard]] bool open();
    void failWriting();
    void fail(std::string problem);
    [[nodiscard]] bool push(Item item, std::size_t bytes, bool wait);

    MoviePlace m_place; // thread only, as the next three
    std::optional<MovieFile> m_file;
    std::optional<PictureFormat> m_picture;
    Fragmenter m_fragmenter;

    mutable std::mutex m_mutex;
    std::condition_variable m_changed;
    std::deque<Item> m_items;  // protected by m_mutex, as all below
    std::size_t m_waiting = 0; // bytes in m_items
    bool m_finishing = false;
    Status m_status;
    std::optional<Nanoseconds> m_writingSince;
    std::thread m_thread;
};

} // namespace qivo::record
