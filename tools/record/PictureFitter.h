#pragma once

#include "tools/record/Handles.h"
#include "tools/record/PictureShape.h"
#include "tools/record/PlanarRows.h"

namespace qivo::record {

/** Brings received pictures into the form in which a movie's pictures are encoded: planes of luma and of halved colour,
 *  of one size; pictures of another aspect stand between black bars. Those that have the size already are done in a
 *  fraction of the time where the processor has AVX2. Thread: one. */
class PictureFitter {
  public:
    /** What may be waiting for the encoder: no more than this time's worth of pictures, since it would be lost to a
     * power cut, and no more than this memory, but always so many that the encoder has some to work on. */
    static constexpr double mostSeconds = 0.4;
    static constexpr std::size_t mostBytes = std::size_t{96} << 20U;
    static constexpr std::size_t fewestPictures = 6;
    static constexpr std::size_t mostPictures = 24;

    explicit PictureFitter(const PictureShape& shape);
    ~PictureFitter();
    PictureFitter(const PictureFitter&) = delete;
    PictureFitter& operator=(const PictureFitter&) = delete;

    /** Whether the frame says that it is of the one form that is asked for. */
    [[nodiscard]] static bool isReadable(const QIVOlib_video_frame_v2_t& frame);
    /** The picture in the movie's form; null if as many as may be are still being encoded, or the frame is not
     * readable.
     */
    [[nodiscard]] Media<GstBuffer> fit(const QIVOlib_video_frame_v2_t& frame);

    [[nodiscard]] const GstVideoInfo& format() const { return m_format; }
    /** False if there is no memory for pictures of this size. */
    [[nodiscard]] bool ready() const { return m_pool != nullptr; }
    /** How many pictures may be waiting for the encoder. */
    [[nodiscard]] static std::size_t mostWaiting(const PictureShape& shape);

  private:
    /** What a conversion depends on. */
    struct Input {
        int width = 0;
        int height = 0;
        int stride = 0;
        PictureArea area;

        friend bool operator==(const Input&, const Input&) = default;
    };

    [[nodiscard]] bool fits(const QIVOlib_video_frame_v2_t& frame) const;
    void convertColours(const QIVOlib_video_frame_v2_t& frame, GstVideoFrame& out) const;
    [[nodiscard]] bool prepare(const QIVOlib_video_frame_v2_t& frame);
    [[nodiscard]] bool convert(const QIVOlib_video_frame_v2_t& frame, GstVideoFrame& out);

    const PictureShape m_shape;
    GstVideoInfo m_format{};
    const PlanarColours m_colours;
    Media<GstBufferPool> m_pool;
    Input m_input;
    GstVideoInfo m_inputFormat{};
    Media<GstVideoConverter> m_converter;
};

} // namespace qivo::record
