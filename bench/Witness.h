#pragma once

#include "tests/platform/TemporaryDirectory.h"
#include "tests/record/MovieReader.h"
#include "tests/support/Process.h"
#include "tests/support/Screen.h"

#include <chrono>
#include <csignal>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <set>
#include <string>
#include <system_error>

/// A second client of the measured source, written by others, which only stores what it receives: what was published,
/// whoever showed or recorded it. On a machine with too much to do a source leaves pictures out itself, and those are
/// nobody's to show.
class Witness {
  public:
    /// Begins to store the stream at an address, and waits until pictures come. Null if none do.
    static std::unique_ptr<Witness> start(const std::string& url) {
        std::unique_ptr<Witness> witness(new Witness);
        witness->m_process = qivo::test::Process::start({"/usr/bin/ffmpeg", "-nostdin", "-loglevel", "error",
                                                         "-rtsp_transport", "tcp", "-i", url, "-map", "0:v", "-c",
                                                         "copy", "-flush_packets", "1", "-y", witness->path()});
        const bool stores = witness->m_process != nullptr && qivo::test::eventually([&] {
                                std::error_code missing;
                                const auto size = std::filesystem::file_size(witness->path(), missing);
                                return !missing && size > 100000;
                            });
        return stores ? std::move(witness) : nullptr;
    }

    /// Ends the storing. The time codes of the pictures received; empty if what was stored cannot be read.
    std::set<std::int64_t> end() {
        m_process->signal(SIGINT);
        if (!m_process->wait(std::chrono::seconds(10))) {
            return {};
        }
        const auto movie = qivo::test::decodeMovie(path());
        std::set<std::int64_t> times;
        for (const auto& picture : movie.pictures) {
            if (picture.published) {
                times.insert(*picture.published);
            }
        }
        return movie.readable ? times : std::set<std::int64_t>();
    }

  private:
    Witness() = default;
    std::string path() const { return m_folder.path("published.mov"); }

    qivo::TemporaryDirectory m_folder;
    std::unique_ptr<qivo::test::Process> m_process; // ends before its folder goes
};

/// How many pictures there are, from the first to the last of `shown` that the witness could have received, that
/// `shown` or the witness knows of, and how many of them are in `shown`.
struct Share {
    std::size_t published = 0;
    std::size_t shown = 0;

    double fraction() const { return published == 0 ? 0 : static_cast<double>(shown) / static_cast<double>(published); }
};

/// Of pictures for which `counts` is true.
template <typename Counts>
Share shareOf(std::set<std::int64_t> shown, std::set<std::int64_t> published, Counts counts) {
    if (published.empty()) {
        return {};
    }
    // Of what came before, nothing is known of pictures that were not shown.
    shown.erase(shown.begin(), shown.lower_bound(*published.begin()));
    if (shown.empty()) {
        return {};
    }
    // The witness may have missed one as well.
    published.insert(shown.begin(), shown.end());
    Share share;
    for (auto picture = published.find(*shown.begin()); picture != published.upper_bound(*shown.rbegin()); ++picture) {
        if (counts(*picture)) {
            ++share.published;
            share.shown += shown.count(*picture);
        }
    }
    return share;
}

inline Share shareOf(const std::set<std::int64_t>& shown, const std::set<std::int64_t>& published) {
    return shareOf(shown, published, [](std::int64_t) { return true; });
}
