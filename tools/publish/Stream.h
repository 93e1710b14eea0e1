#pragma once

#include "tools/publish/Handles.h"
#include "tools/publish/NeededElement.h"
#include "tools/publish/PictureSource.h"
#include "tools/publish/Sound.h"

#include <functional>
#include <gst/rtsp-server/rtsp-server.h>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace qivo {

/** The elements that a stream of this codec needs. */
[[nodiscard]] std::vector<NeededElement> elementsFor(Codec codec);

/** The sound of a stream. */
struct StreamSound {
    SoundFormat format;
    SoundCodec codec = SoundCodec::l16;
    MakeSound make; ///< called, on any thread, whenever the first viewer comes
};

/** The pipeline from pictures to RTP packets, as gst-rtsp-server takes it: an appsrc "picture", an element "encoder"
 * and a payloader "pay0"; with a sound codec also an appsrc "sound" and a payloader "pay1". */
[[nodiscard]] std::string encoderPipeline(const PictureFormat& format, Codec codec,
                                          std::optional<SoundCodec> sound = std::nullopt);

/** Bits a second, in thousands, for pictures of this format. */
[[nodiscard]] int bitRateFor(const PictureFormat& format);

using MakePictures = std::function<std::unique_ptr<PictureSource>()>;

/** A factory of one live stream: encoded once for all who watch it, and only while somebody does. `makePictures` is
 *  called, on any thread, whenever the first viewer comes. */
[[nodiscard]] Object<GstRTSPMediaFactory> makeStreamFactory(const PictureFormat& format, Codec codec,
                                                            MakePictures makePictures,
                                                            std::optional<StreamSound> sound = std::nullopt);

/** Asks the stream's encoder for a key picture, so that a viewer who comes late sees something at once. */
void requestKeyPicture(GstRTSPMedia* media);

} // namespace qivo
