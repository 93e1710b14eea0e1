#pragma once

#include "tools/record/MovieAtoms.h"

#include <cstdint>
#include <string>

namespace qivo::record {

/** An open file, closed with this object. */
class FileHandle {
  public:
    explicit FileHandle(int descriptor = -1) : m_descriptor(descriptor) {}
    FileHandle(FileHandle&& other) noexcept : m_descriptor(other.release()) {}
    FileHandle& operator=(FileHandle&& other) noexcept;
    FileHandle(const FileHandle&) = delete;
    FileHandle& operator=(const FileHandle&) = delete;
    ~FileHandle();

    [[nodiscard]] int get() const { return m_descriptor; }
    explicit operator bool() const { return m_descriptor >= 0; }

  private:
    int release();

    int m_descriptor;
};

/** A QuickTime movie that can be played up to its last fragment at any time, and becomes a plain one with a complete
 *  index when it is finished.
 *
 *  The file begins with a head of fixed length that describes the tracks; a track may join later, since the head is
 *  written anew with each fragment. Fragments follow. Finishing appends the complete index, then turns the head's
 *  placeholder into the header of one data atom that spans head and fragments: one small write decides between the two.
 *
 *  Failures answer false and leave what was written before playable; `error` says what happened. Thread: one. */
class MovieFile {
  public:
    /** A new file, empty and open for writing. */
    explicit MovieFile(FileHandle file);

    /** Before the first fragment with pictures. */
    void setPicture(PictureFormat format) { m_info.picture = std::move(format); }
    /** Before the first fragment with sound. */
    void setSound(SoundFormat format) { m_info.sound = format; }

    /** Writes a fragment and hands it to the disk. Nothing happens with an empty one. */
    [[nodiscard]] bool append(const Fragment& fragment);
    /** Makes a plain movie of what was written, or leaves it one of fragments where it is too long for an index;
     * nothing more can be appended. */
    [[nodiscard]] bool finish();

    [[nodiscard]] const SampleTables& tables() const { return m_tables; }
    /** Length of the file in bytes. */
    [[nodiscard]] std::uint64_t size() const { return m_end; }
    /** Whether anything was written that can be played. */
    [[nodiscard]] bool isEmpty() const { return m_sequence == 0; }
    /** What the last failure was; empty if there was none. */
    [[nodiscard]] std::string error() const;

  private:
    [[nodiscard]] bool write(const std::vector<std::uint8_t>& data, std::uint64_t offset);
    [[nodiscard]] bool writeHead();
    [[nodiscard]] bool writeFragment(const Fragment& fragment);
    [[nodiscard]] bool toDisk();
    [[nodiscard]] std::uint64_t links() const;
    [[nodiscard]] bool stillThere();
    void cutToWhole();

    FileHandle m_file;
    MovieInfo m_info;
    SampleTables m_tables;
    std::uint64_t m_end = 0; ///< of what is complete
    std::uint32_t m_sequence = 0;
    int m_error = 0;        ///< the system's number
    bool m_hasName = false; ///< had one, as far as the file system tells
    bool m_deleted = false;
};

} // namespace qivo::record
