#include "platform/SurfaceMemory.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <linux/magic.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/vfs.h>
#include <system_error>
#include <utility>

namespace qivo {

namespace {

/// What goes over the socket beside the descriptor.
struct Message {
    std::array<char, 8> mark = {'q', 'i', 'v', 'o', 's', 'u', 'r', '1'}; ///< the last one counts the layout's changes
    SurfaceLayout layout;
};

/// Room for one descriptor, aligned as the system wants it.
union Ancillary {
    cmsghdr header;
    std::array<char, CMSG_SPACE(sizeof(int))> bytes{};
};

/// With its padding there would be room for a second descriptor, which nobody would close.
msghdr header(iovec& content, Ancillary& ancillary) {
    msghdr header{};
    header.msg_iov = &content;
    header.msg_iovlen = 1;
    header.msg_control = ancillary.bytes.data();
    header.msg_controllen = CMSG_LEN(sizeof(int));
    return header;
}

std::string systemError(const char* what) {
    return std::string(what) + ": " + std::generic_category().message(errno);
}

bool isWritable(const FileDescriptor& file) {
    return (::fcntl(file.number(), F_GETFL) & O_ACCMODE) == O_RDWR;
}

/// A descriptor of the file for reading alone: what a descriptor permits goes with it. One that permits no more is
/// good as it is, and its maker may not let it be opened once more.
FileDescriptor readOnly(const FileDescriptor& file) {
    if (!isWritable(file)) {
        return FileDescriptor(::fcntl(file.number(), F_DUPFD_CLOEXEC, 0));
    }
    const std::string path = "/proc/self/fd/" + std::to_string(file.number());
    return FileDescriptor(::open(path.c_str(), O_RDONLY | O_CLOEXEC));
}

bool sendMessage(int socket, Message& message, int descriptor) {
    iovec content{&message, sizeof message};
    Ancillary ancillary;
    const msghdr sent = header(content, ancillary);
    cmsghdr* control = CMSG_FIRSTHDR(&sent);
    control->cmsg_level = SOL_SOCKET;
    control->cmsg_type = SCM_RIGHTS;
    control->cmsg_len = CMSG_LEN(sizeof descriptor);
    std::memcpy(CMSG_DATA(control), &descriptor, sizeof descriptor);
    ssize_t count = 0;
    do {
        count = ::sendmsg(socket, &sent, MSG_NOSIGNAL);
    } while (count < 0 && errno == EINTR);
    return count == static_cast<ssize_t>(sizeof message);
}

/// The one descriptor of a message. The system itself drops those that there is no room for.
FileDescriptor descriptorIn(msghdr& received) {
    const cmsghdr* control = CMSG_FIRSTHDR(&received);
    int descriptor = -1;
    if (control && control->cmsg_level == SOL_SOCKET && control->cmsg_type == SCM_RIGHTS &&
        control->cmsg_len == CMSG_LEN(sizeof descriptor)) {
        std::memcpy(&descriptor, CMSG_DATA(control), sizeof descriptor);
    }
    return FileDescriptor(descriptor);
}

/// The message and its descriptor; no descriptor, and why not, if what arrived is anything else.
FileDescriptor receiveMessage(int socket, Message& message, std::string& error) {
    iovec content{&message, sizeof message};
    Ancillary ancillary;
    msghdr received = header(content, ancillary);
    ssize_t count = 0;
    do {
        count = ::recvmsg(socket, &received, MSG_CMSG_CLOEXEC | MSG_WAITALL);
    } while (count < 0 && errno == EINTR);
    if (count < 0) {
        error = systemError("Receiving a surface");
        return FileDescriptor();
    }
    FileDescriptor file = descriptorIn(received);
    const bool whole =
        count == static_cast<ssize_t>(sizeof message) && !(received.msg_flags & (MSG_TRUNC | MSG_CTRUNC));
    if (!file || !whole || message.mark != Message().mark) {
        error = count == 0 ? "The connection has ended" : "What was received is no surface";
        return FileDescriptor();
    }
    return file;
}

/// Why the memory is not what a surface of this layout needs; empty if it is. Only ordinary shared memory will do: of
/// huge pages, for one, its owner can take some back, seals or no seals.
std::string objection(const FileDescriptor& file, const SurfaceLayout& layout) {
    if (!isSound(layout, IOSurface::maximumBytes())) {
        return "The sizes of the surface that was received do not fit each other or this machine";
    }
    struct statfs system {};
    struct stat status {};
    if (::fstatfs(file.number(), &system) != 0 || ::fstat(file.number(), &status) != 0 ||
        system.f_type != TMPFS_MAGIC || !S_ISREG(status.st_mode)) {
        return "The surface that was received is not shared memory";
    }
    const int seals = ::fcntl(file.number(), F_GET_SEALS);
    if (seals < 0 || (seals & IOSurface::seals) != IOSurface::seals) {
        return "The memory of the surface that was received is not sealed";
    }
    // Only now that its size is sealed can it be relied upon.
    if (::fstat(file.number(), &status) != 0 ||
        static_cast<std::uint64_t>(status.st_size) != IOSurface::fileBytes(layout)) {
        return "The memory of the surface that was received has another size";
    }
    return {};
}

} // namespace

bool IOSurfaceSend(int socket, IOSurfaceRef surface, SurfaceAccess access, std::string& error) {
    if (!surface) {
        error = "There is no surface to send";
        return false;
    }
    const FileDescriptor restricted = access == SurfaceAccess::readOnly ? readOnly(surface->file()) : FileDescriptor();
    if (access == SurfaceAccess::readOnly && !restricted) {
        error = systemError("Opening the surface for reading");
        return false;
    }
    Message message;
    message.layout = surface->layout();
    if (!sendMessage(socket, message, (restricted ? restricted : surface->file()).number())) {
        error = systemError("Sending a surface");
        return false;
    }
    return true;
}

std::shared_ptr<IOSurface> IOSurfaceReceive(int socket, std::string& error) {
    Message message;
    FileDescriptor file = receiveMessage(socket, message, error);
    if (!file) {
        return nullptr;
    }
    error = objection(file, message.layout);
    if (!error.empty()) {
        return nullptr;
    }
    const bool writable = isWritable(file);
    SharedMapping mapping(file, IOSurface::fileBytes(message.layout), writable);
    if (!mapping.memory()) {
        error = systemError("Mapping a surface");
        return nullptr;
    }
    return std::make_shared<IOSurface>(message.layout, std::move(file), std::move(mapping), writable);
}

} // namespace qivo
