#include "tools/record/MovieFile.h"

#include <cerrno>
#include <cstring>
#include <ctime>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace qivo::record {
namespace {

constexpr std::uint64_t secondsFrom1904To1970 = 2082844800;

} // namespace

FileHandle& FileHandle::operator=(FileHandle&& other) noexcept {
    std::swap(m_descriptor, other.m_descriptor);
    return *this;
}

FileHandle::~FileHandle() {
    if (m_descriptor >= 0) {
        close(m_descriptor);
    }
}

int FileHandle::release() {
    return std::exchange(m_descriptor, -1);
}

MovieFile::MovieFile(FileHandle file) : m_file(std::move(file)) {
    m_hasName = links() > 0;
    m_info.created = static_cast<std::uint64_t>(std::time(nullptr)) + secondsFrom1904To1970;
}

bool MovieFile::write(const std::vector<std::uint8_t>& data, std::uint64_t offset) {
    std::size_t done = 0;
    while (done < data.size()) {
        const ssize_t count =
            pwrite(m_file.get(), data.data() + done, data.size() - done, static_cast<off_t>(offset + done));
        if (count < 0 && errno == EINTR) {
            continue;
        }
        if (count <= 0) {
            m_error = count < 0 ? errno : EIO;
            return false;
        }
        done += static_cast<std::size_t>(count);
    }
    return true;
}

bool MovieFile::toDisk() {
    // What cannot be synchronised, as on some network file systems, is no reason to stop.
    if (fdatasync(m_file.get()) == 0 || errno == EINVAL || errno == ENOSYS) {
        return true;
    }
    m_error = errno;
    return false;
}

/// How many names the file has.
std::uint64_t MovieFile::links() const {
    struct stat about {};
    return fstat(m_file.get(), &about) == 0 ? about.st_nlink : 1;
}

/// What nobody can find any more would be written until the disk is full. Some file systems say so of every file.
bool MovieFile::stillThere() {
    m_deleted = m_hasName && links() == 0;
    return !m_deleted;
}

std::string MovieFile::error() const {
    return m_deleted ? "it has been deleted" : m_error != 0 ? std::strerror(m_error) : "";
}

bool MovieFile::writeHead() {
    return write(headOf(m_info, m_tables), 0);
}

bool MovieFile::writeFragment(const Fragment& fragment) {
    std::uint64_t place = m_end;
    const auto next = [&](const std::vector<std::uint8_t>& data) {
        const bool written = write(data, place);
        place += data.size();
        return written;
    };
    bool written = next(fragmentHead(m_info, fragment, m_sequence + 1));
    const std::uint64_t data = place;
    for (const MoviePicture& picture : fragment.pictures) {
        written = written && next(picture.bytes);
    }
    written = written && next(fragment.sound) && toDisk();
    if (!written) {
        return false;
    }
    m_tables.add(fragment, data, m_info.sound ? bytesPerSoundFrame(*m_info.sound) : 1);
    m_end = place;
    ++m_sequence;
    return true;
}

bool MovieFile::append(const Fragment& fragment) {
    if (fragment.pictures.empty() && fragment.sound.empty()) {
        return true;
    }
    if (m_end == 0) {
        if (!writeHead()) {
            return false;
        }
        m_end = headBytes;
    }
    if (writeFragment(fragment) && writeHead() && stillThere()) {
        return true;
    }
    cutToWhole();
    return false;
}

/// What is not whole would confuse those who read what is.
void MovieFile::cutToWhole() {
    if (ftruncate(m_file.get(), static_cast<off_t>(m_end)) != 0 && m_error == 0) {
        m_error = errno;
    }
}

bool MovieFile::finish() {
    if (m_end == 0 || !m_tables.fitsIndex()) {
        return true;
    }
    const std::vector<std::uint8_t> index = indexOf(m_info, m_tables);
    if (write(index, m_end) && toDisk() && write(dataHeader(m_end), dataHeaderOffset)) {
        m_end += index.size();
        return true;
    }
    cutToWhole();
    return false;
}

} // namespace qivo::record
