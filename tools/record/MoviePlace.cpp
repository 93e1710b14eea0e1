#include "tools/record/MoviePlace.h"

#include <array>
#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace qivo::record {
namespace {

constexpr std::size_t longestName = 255;
constexpr int mostAttempts = 1000;
constexpr mode_t folderMode = 0777;
constexpr mode_t fileMode = 0666;

std::string folderOf(const std::string& path) {
    const std::size_t slash = path.rfind('/');
    if (slash == std::string::npos) {
        return ".";
    }
    return slash == 0 ? "/" : path.substr(0, slash);
}

std::string fileNameOf(const std::string& path) {
    return path.substr(path.rfind('/') + 1);
}

/// Where a path ends in the source's name, all of the name comes after the folder.
std::string folderFor(const std::string& source, const std::string& path) {
    const std::string ending = "/" + source + ".mov";
    if (path.size() > ending.size() && path.compare(path.size() - ending.size(), ending.size(), ending) == 0) {
        return path.substr(0, path.size() - ending.size());
    }
    return folderOf(path);
}

/// A new name for a file without ever replacing another, 0 or the system's number of the failure.
int renameWithoutReplacing(const std::string& from, const std::string& to) {
    if (renameat2(AT_FDCWD, from.c_str(), AT_FDCWD, to.c_str(), RENAME_NOREPLACE) == 0) {
        return 0;
    }
    if (errno != EINVAL && errno != ENOSYS) {
        return errno;
    }
    // A file system that cannot do that in one step.
    struct stat other {};
    if (lstat(to.c_str(), &other) == 0) {
        return EEXIST;
    }
    return std::rename(from.c_str(), to.c_str()) == 0 ? 0 : errno;
}

/// 0 if a file can be made in a folder, else the system's number of the failure.
int tryFolder(const std::string& folder) {
    std::string pattern = folder + "/.recording-XXXXXX";
    const int descriptor = mkostemp(pattern.data(), O_CLOEXEC);
    if (descriptor < 0) {
        return errno;
    }
    const FileHandle closed(descriptor);
    unlink(pattern.c_str());
    return 0;
}

} // namespace

bool climbs(const std::string& path) {
    return ("/" + path + "/").find("/../") != std::string::npos;
}

std::string keptName(const std::string& fileName, std::time_t time, int attempt) {
    std::tm local{};
    localtime_r(&time, &local);
    std::array<char, 32> text{};
    std::strftime(text.data(), text.size(), " %Y-%m-%d %H.%M.%S", &local);
    const std::size_t dot = fileName.rfind('.');
    const std::string extension = dot == std::string::npos || dot == 0 ? "" : fileName.substr(dot);
    const std::string ending = text.data() + (attempt > 1 ? " (" + std::to_string(attempt) + ")" : "") + extension;
    std::string stem = fileName.substr(0, fileName.size() - extension.size());
    while (stem.size() + ending.size() > longestName && !stem.empty()) {
        const auto isInside = [](char byte) { return (static_cast<unsigned char>(byte) & 0xC0U) == 0x80U; };
        while (stem.size() > 1 && isInside(stem.back())) {
            stem.pop_back();
        }
        stem.pop_back();
    }
    return stem + ending;
}

MoviePlace::MoviePlace(const std::string& source, std::string path)
    : m_path(std::move(path)), m_folder(folderFor(source, m_path)) {}

std::string MoviePlace::reason(const std::string& what, int error) const {
    return "cannot " + what + ": " + std::strerror(error);
}

std::string MoviePlace::problem() const {
    const std::string name = fileNameOf(m_path);
    if (climbs(m_path)) {
        return "cannot record to \"" + m_path + "\": \"..\" would lead out of the folder";
    }
    if (name.empty() || name == ".") {
        return "cannot record to \"" + m_path + "\": that is no file's name";
    }
    if (const int error = tryFolder(m_folder); error != 0) {
        return reason("record into the folder \"" + m_folder + "\"", error);
    }
    struct stat existing {};
    if (lstat(m_path.c_str(), &existing) != 0 && errno != ENOENT) {
        return reason("record to \"" + m_path + "\"", errno);
    }
    return {};
}

bool MoviePlace::makeFolders(std::string& problem) const {
    for (std::size_t slash = m_path.find('/', m_folder.size() + 1); slash != std::string::npos;
         slash = m_path.find('/', slash + 1)) {
        const std::string folder = m_path.substr(0, slash);
        if (mkdir(folder.c_str(), folderMode) != 0 && errno != EEXIST) {
            problem = reason("make the folder \"" + folder + "\"", errno);
            return false;
        }
    }
    return true;
}

/// The names in the movie's folder, and those of the folders that may have been made.
void MoviePlace::foldersToDisk() const {
    std::string folder = folderOf(m_path);
    while (true) {
        const FileHandle opened(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
        fsync(opened.get()); // which some file systems cannot
        if (folder.size() <= m_folder.size()) {
            return;
        }
        folder = folderOf(folder);
    }
}

void MoviePlace::takeBack() {
    struct stat there {};
    if (lstat(m_path.c_str(), &there) != 0 || there.st_dev != m_made.st_dev || there.st_ino != m_made.st_ino) {
        return;
    }
    unlink(m_path.c_str());
    giveBack();
}

/// What had the movie's name before has it again.
void MoviePlace::giveBack() {
    if (!m_kept.empty()) {
        renameWithoutReplacing(m_kept, m_path);
        m_kept.clear();
    }
    foldersToDisk();
}

bool MoviePlace::keepExisting(std::string& problem) {
    struct stat existing {};
    if (lstat(m_path.c_str(), &existing) != 0) {
        return true;
    }
    int error = EEXIST;
    for (int attempt = 1; error == EEXIST && attempt <= mostAttempts; ++attempt) {
        m_kept = folderOf(m_path) + "/" + keptName(fileNameOf(m_path), existing.st_mtime, attempt);
        error = renameWithoutReplacing(m_path, m_kept);
    }
    if (error != 0) {
        m_kept.clear();
    }
    if (error != 0 && error != ENOENT) {
        problem = reason("keep the movie that is there as \"" + m_path + "\"", error);
        return false;
    }
    return true;
}

FileHandle MoviePlace::create(std::string& problem) {
    if (!makeFolders(problem)) {
        return FileHandle();
    }
    int error = EEXIST;
    for (int attempt = 0; error == EEXIST && attempt < mostAttempts; ++attempt) {
        if (!keepExisting(problem)) {
            return FileHandle();
        }
        FileHandle file(open(m_path.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, fileMode));
        if (file) {
            fstat(file.get(), &m_made);
            foldersToDisk();
            return file;
        }
        error = errno;
    }
    giveBack();
    problem = reason("record to \"" + m_path + "\"", error);
    return FileHandle();
}

} // namespace qivo::record
