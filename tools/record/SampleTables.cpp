#include "tools/record/SampleTables.h"

#include <algorithm>
#include <limits>

namespace qivo::record {

void SampleTables::add(const Fragment& fragment, std::uint64_t offset, std::size_t soundFrameBytes) {
    if (!fragment.pictures.empty()) {
        pictureChunks.push_back({offset, static_cast<std::uint32_t>(fragment.pictures.size())});
    }
    for (const MoviePicture& picture : fragment.pictures) {
        if (!pictures.empty()) {
            pictures.back().duration = pictureDuration(picture.start - pictures.back().start);
        }
        const auto size = static_cast<std::uint32_t>(picture.bytes.size());
        pictures.push_back({picture.start, picture.duration, size, picture.key});
        offset += size;
    }
    if (!fragment.sound.empty()) {
        if (soundChunks.empty()) {
            soundStart = fragment.soundStart;
        }
        const auto frames = static_cast<std::uint32_t>(fragment.sound.size() / soundFrameBytes);
        soundChunks.push_back({offset, frames});
        soundFrames += frames;
    }
}

std::int64_t SampleTables::pictureEnd() const {
    return pictures.empty() ? 0 : pictures.back().start + pictures.back().duration;
}

bool SampleTables::fitsIndex() const {
    // Readers take the number for a signed one.
    constexpr std::uint32_t last = std::numeric_limits<std::int32_t>::max();
    return soundFrames <= std::numeric_limits<std::uint32_t>::max() &&
           std::all_of(pictures.begin(), pictures.end(),
                       [](const Picture& picture) { return picture.duration < last; });
}

} // namespace qivo::record
