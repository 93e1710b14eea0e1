#include "tools/publish/TextMask.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <memory>
#include <pango/pangocairo.h>

namespace qivo {
namespace {

template <auto Free>
struct Release {
    template <typename T>
    void operator()(T* object) const {
        Free(object);
    }
};
using Surface = std::unique_ptr<cairo_surface_t, Release<cairo_surface_destroy>>;
using Context = std::unique_ptr<cairo_t, Release<cairo_destroy>>;
using Layout = std::unique_ptr<PangoLayout, Release<g_object_unref>>;
using Font = std::unique_ptr<PangoFontDescription, Release<pango_font_description_free>>;

constexpr double smallestShrink = 0.5;

// Sets the font so that a line is `height` pixels high.
void setHeight(PangoLayout* layout, double height) {
    const Font font(pango_font_description_from_string("Sans Bold"));
    constexpr double lineHeightPerSize = 1.2;
    pango_font_description_set_absolute_size(font.get(), height / lineHeightPerSize * PANGO_SCALE);
    pango_layout_set_font_description(layout, font.get());
}

int widthOf(PangoLayout* layout) {
    int width = 0;
    pango_layout_get_pixel_size(layout, &width, nullptr);
    return width;
}

void fit(PangoLayout* layout, int maximumWidth, int height) {
    setHeight(layout, height);
    const int width = widthOf(layout);
    if (width <= maximumWidth) {
        return;
    }
    setHeight(layout, height * std::max(smallestShrink, static_cast<double>(maximumWidth) / width));
    if (widthOf(layout) > maximumWidth) {
        pango_layout_set_width(layout, maximumWidth * PANGO_SCALE);
        pango_layout_set_ellipsize(layout, PANGO_ELLIPSIZE_END);
    }
}

} // namespace

TextMask renderText(const std::string& text, int maximumWidth, int height) {
    const Surface measuring(cairo_image_surface_create(CAIRO_FORMAT_A8, 1, 1));
    const Context measurer(cairo_create(measuring.get()));
    const Layout layout(pango_cairo_create_layout(measurer.get()));
    pango_layout_set_single_paragraph_mode(layout.get(), TRUE);
    pango_layout_set_text(layout.get(), text.c_str(), static_cast<int>(text.size()));
    fit(layout.get(), maximumWidth, height);
    int lineHeight = 0;
    int width = 0;
    pango_layout_get_pixel_size(layout.get(), &width, &lineHeight);

    TextMask mask{std::clamp(width, 1, std::max(1, maximumWidth)), std::max(1, height), {}};
    const Surface surface(cairo_image_surface_create(CAIRO_FORMAT_A8, mask.width, mask.height));
    const Context context(cairo_create(surface.get()));
    cairo_move_to(context.get(), 0, (mask.height - lineHeight) / 2.0);
    pango_cairo_show_layout(context.get(), layout.get());
    cairo_surface_flush(surface.get());
    mask.coverage.resize(static_cast<std::size_t>(mask.width) * mask.height);
    const std::uint8_t* pixels = cairo_image_surface_get_data(surface.get());
    const int stride = cairo_image_surface_get_stride(surface.get());
    for (int y = 0; pixels != nullptr && y < mask.height; ++y) {
        std::memcpy(&mask.coverage[static_cast<std::size_t>(y) * mask.width],
                    pixels + static_cast<std::ptrdiff_t>(y) * stride, mask.width);
    }
    return mask;
}

} // namespace qivo
