#pragma once

#include "platform/FileDescriptor.h"
#include "platform/SurfaceLayout.h"

#include <array>
#include <cstddef>
#include <cstring>
#include <stdexcept>
#include <sys/socket.h>
#include <utility>
#include <vector>

namespace qivo {

/// What goes over a socket beside a surface's descriptor.
struct SurfaceMessage {
    std::array<char, 8> mark = {'q', 'i', 'v', 'o', 's', 'u', 'r', '1'};
    SurfaceLayout layout;
};

/// Two ends of a Unix socket. One of them can send messages of the test's own.
class SurfaceSocket {
  public:
    explicit SurfaceSocket(int type = SOCK_STREAM) {
        std::array<int, 2> ends{};
        if (::socketpair(AF_UNIX, type, 0, ends.data()) != 0) {
            throw std::runtime_error("cannot make a socket");
        }
        _here = FileDescriptor(ends[0]);
        _there = FileDescriptor(ends[1]);
    }

    int here() const { return _here.number(); }
    int there() const { return _there.number(); }
    void closeHere() { _here = close(std::move(_here)); }
    void closeThere() { _there = close(std::move(_there)); }

    void send(const SurfaceMessage& message, const std::vector<int>& descriptors,
              std::size_t bytes = sizeof(SurfaceMessage)) {
        SurfaceMessage content = message;
        iovec part{&content, bytes};
        std::vector<std::byte> ancillary(CMSG_SPACE(descriptors.size() * sizeof(int)));
        msghdr header{};
        header.msg_iov = &part;
        header.msg_iovlen = 1;
        if (!descriptors.empty()) {
            header.msg_control = ancillary.data();
            header.msg_controllen = ancillary.size();
            cmsghdr* control = CMSG_FIRSTHDR(&header);
            control->cmsg_level = SOL_SOCKET;
            control->cmsg_type = SCM_RIGHTS;
            control->cmsg_len = CMSG_LEN(descriptors.size() * sizeof(int));
            std::memcpy(CMSG_DATA(control), descriptors.data(), descriptors.size() * sizeof(int));
        }
        if (::sendmsg(here(), &header, MSG_NOSIGNAL) != static_cast<ssize_t>(bytes)) {
            throw std::runtime_error("cannot send");
        }
    }

  private:
    static FileDescriptor close(FileDescriptor) { return FileDescriptor(); }

    FileDescriptor _here;
    FileDescriptor _there;
};

} // namespace qivo
