#pragma once

#include "tools/record/AtomWriter.h"
#include "tools/record/MovieFormat.h"

namespace qivo::record {

/** The entry of a picture track's sample description: H.264, with the shape of a pixel and the meaning of colours. */
void describePictures(AtomWriter& out, const PictureFormat& format);

/** The entry of a sound track's sample description: uncompressed, of any rate and number of channels. */
void describeSound(AtomWriter& out, const SoundFormat& format);

/** Whether pictures of this height have the colours of BT.709 (else BT.601), as they have without being told. */
[[nodiscard]] bool isHighDefinition(int height);

} // namespace qivo::record
