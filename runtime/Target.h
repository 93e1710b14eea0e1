#pragma once

#include "runtime/SourceView.h"

#include <optional>
#include <string>

namespace qivo::runtime {

/// What a receiver was asked for. One of the two strings may be empty.
struct Request {
    std::string name;
    std::string url;
    int bandwidth = 0; ///< a QIVOlib_recv_bandwidth
};

/// The announcement of the requested source: by name where one was given, else by URL.
std::optional<Announcement> announcementOf(const Request& request, const SourceView& view);

/// Where to connect to; empty while a source that is known by name alone has not been announced.
///
/// The first attempt goes to the URL that was given, if one was. Every later one follows the announcement of the named
/// source, which may have come back at another address. The low-bandwidth stream is taken where it is announced. A
/// login in the given URL is also used for what is announced on the same host and port.
std::string targetUrl(const Request& request, const std::optional<Announcement>& announcement, bool first);

/// `url` with the login that `from` carries, if it has none and both lead to the same host and port: a login is never
/// carried to another machine.
std::string withLoginOf(const std::string& url, const std::string& from);

/// The URL without login and query: what identifies a source in memory and in messages.
std::string sourceKey(const std::string& url);

} // namespace qivo::runtime
