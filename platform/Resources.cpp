#include "platform/Resources.h"

#include <filesystem>
#include <mutex>
#include <system_error>
#include <utility>

namespace qivo {

namespace {

std::mutex pathLock;
std::string otherPath; // under pathLock

std::string besideTheProgram() {
    std::error_code error;
    const auto program = std::filesystem::read_symlink("/proc/self/exe", error);
    return (program.parent_path() / ".." / "share" / "qivo-viewer").lexically_normal().string();
}

} // namespace

std::string resourcePath() {
    static const std::string standardPath = besideTheProgram();
    const std::lock_guard lock(pathLock);
    return otherPath.empty() ? standardPath : otherPath;
}

void setResourcePath(std::string path) {
    const std::lock_guard lock(pathLock);
    otherPath = std::move(path);
}

} // namespace qivo
