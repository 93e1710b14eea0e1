#include "runtime/Target.h"

#include "runtime/Log.h"
#include "sdk/qivo.h"

#include <algorithm>
#include <string_view>

namespace qivo::runtime {
namespace {

/// The part of a URL between "//" and the path.
struct Authority {
    std::size_t begin = 0;  ///< where it begins in the URL
    std::string_view login; ///< with its @; empty if there is none
    std::string_view host;  ///< with its port
};

Authority authorityOf(std::string_view url) {
    const std::size_t slashes = url.find("//");
    if (slashes == std::string_view::npos) {
        return {url.size(), {}, {}};
    }
    const std::size_t begin = slashes + 2;
    const std::string_view all = url.substr(begin, std::min(url.find_first_of("/?#", begin), url.size()) - begin);
    const std::size_t at = all.rfind('@');
    const std::size_t login = at == std::string_view::npos ? 0 : at + 1;
    return {begin, all.substr(0, login), all.substr(login)};
}

} // namespace

std::optional<Announcement> announcementOf(const Request& request, const SourceView& view) {
    if (!request.name.empty()) {
        if (auto found = view.findByName(request.name)) {
            return found;
        }
    }
    return request.url.empty() ? std::nullopt : view.findByUrl(withoutLogins(request.url));
}

std::string targetUrl(const Request& request, const std::optional<Announcement>& announcement, bool first) {
    if (!announcement) {
        return request.url;
    }
    const bool low = request.bandwidth == QIVOlib_recv_bandwidth_lowest && !announcement->lowUrl.empty();
    if (low) {
        return withLoginOf(announcement->lowUrl, request.url);
    }
    const bool follow = request.url.empty() || (!first && !request.name.empty());
    return follow ? withLoginOf(announcement->url, request.url) : request.url;
}

std::string withLoginOf(const std::string& url, const std::string& from) {
    const Authority to = authorityOf(url);
    const Authority given = authorityOf(from);
    if (!to.login.empty() || given.login.empty() || to.host != given.host) {
        return url;
    }
    return url.substr(0, to.begin) + std::string(given.login) + url.substr(to.begin);
}

std::string sourceKey(const std::string& url) {
    const std::string plain = withoutLogins(url);
    return plain.substr(0, plain.find('?'));
}

} // namespace qivo::runtime
