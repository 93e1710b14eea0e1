#include "runtime/PictureConverter.h"

#include "runtime/GstChain.h"
#include "runtime/GstHandles.h"
#include "runtime/RgbaRow.h"

#include <cstddef>
#include <cstdint>
#include <gst/video/gstvideofilter.h>
#include <gst/video/video.h>
#include <optional>

namespace qivo::runtime {
namespace {

/// Nothing for what is left to videoconvert.
std::optional<RgbaColours> coloursOf(const GstVideoFrame& in, const GstVideoFrame& out) {
    const GstVideoFormat format = GST_VIDEO_FRAME_FORMAT(&in);
    const GstVideoColorimetry& colorimetry = in.info.colorimetry;
    const bool full = colorimetry.range == GST_VIDEO_COLOR_RANGE_0_255;
    double red = 0;
    double blue = 0;
    if ((format != GST_VIDEO_FORMAT_I420 && format != GST_VIDEO_FORMAT_Y42B) ||
        GST_VIDEO_FRAME_FORMAT(&out) != GST_VIDEO_FORMAT_RGBA || GST_VIDEO_FRAME_IS_INTERLACED(&in) ||
        (!full && colorimetry.range != GST_VIDEO_COLOR_RANGE_16_235) ||
        gst_video_color_matrix_get_Kr_Kb(colorimetry.matrix, &red, &blue) == FALSE || !hasRgbaRow()) {
        return std::nullopt;
    }
    return RgbaColours::of(red, blue, full);
}

GstFlowReturn transformFrame(GstVideoFilter* filter, GstVideoFrame* in, GstVideoFrame* out) {
    const auto colours = coloursOf(*in, *out);
    if (!colours) {
        const gpointer above = g_type_class_peek_parent(G_OBJECT_GET_CLASS(filter));
        return GST_VIDEO_FILTER_CLASS(above)->transform_frame(filter, in, out);
    }
    const auto row = [](const GstVideoFrame* frame, int plane, int index) {
        return static_cast<std::uint8_t*>(frame->data[plane]) +
               static_cast<std::ptrdiff_t>(index) * GST_VIDEO_FRAME_PLANE_STRIDE(frame, plane);
    };
    const int shared = GST_VIDEO_FRAME_FORMAT(in) == GST_VIDEO_FORMAT_I420 ? 2 : 1; // rows with the same chroma
    for (int y = 0; y < GST_VIDEO_FRAME_HEIGHT(in); ++y) {
        rgbaRow(*colours, row(in, 0, y), row(in, 1, y / shared), row(in, 2, y / shared), row(out, 0, y),
                GST_VIDEO_FRAME_WIDTH(in));
    }
    return GST_FLOW_OK;
}

void initializeClass(gpointer type, gpointer /*data*/) {
    GST_VIDEO_FILTER_CLASS(type)->transform_frame = transformFrame;
}

/// A class below that of videoconvert. Its plug-in does not declare that to others, but no more than its size has to be
/// known. 0 if there is no such element.
GType newConverterType() {
    constexpr const char* kName = "QivoPictureConverter";
    GstElement* element = makeElement("videoconvert");
    if (element == nullptr) {
        return 0;
    }
    const GstOwned<GstElement> owned(GST_ELEMENT(gst_object_ref_sink(element)));
    if (const GType registered = g_type_from_name(kName); registered != 0 || !GST_IS_VIDEO_FILTER(element)) {
        return registered; // by another copy of this code in the same process
    }
    GTypeQuery above;
    g_type_query(G_OBJECT_TYPE(element), &above);
    GTypeInfo info{};
    info.class_size = static_cast<guint16>(above.class_size);
    info.class_init = initializeClass;
    info.instance_size = static_cast<guint16>(above.instance_size);
    return g_type_register_static(above.type, kName, &info, G_TYPE_FLAG_NONE);
}

} // namespace

GstElement* makePictureConverter() {
    static const GType type = newConverterType();
    return type == 0 ? makeElement("videoconvert") : GST_ELEMENT(g_object_new(type, nullptr));
}

} // namespace qivo::runtime
