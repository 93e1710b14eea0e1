#pragma once

#include "runtime/Announcement.h"

#include <functional>
#include <memory>
#include <optional>
#include <string_view>

namespace qivo::runtime {

/// What a receiver knows of the announcements on the network.
///
/// Thread: any.
class SourceView {
  public:
    virtual ~SourceView() = default;

    virtual std::optional<Announcement> findByName(std::string_view name) const = 0;
    virtual std::optional<Announcement> findByUrl(std::string_view url) const = 0;

    /// Calls `changed` after every change, from a thread of the view, until the result is let go; letting go waits for
    /// a call that is under way. The listener must not call back into the view.
    virtual std::shared_ptr<void> subscribe(std::function<void()> changed) = 0;
};

} // namespace qivo::runtime
