#include "tests/video/PictureFiles.h"

#include <cstdio>
#include <cstring>
#include <jpeglib.h>
#include <memory>
#include <png.h>
#include <stdexcept>
#include <tiffio.h>

namespace qivo {

namespace {

struct Close {
    void operator()(std::FILE* file) const { std::fclose(file); }
};
using File = std::unique_ptr<std::FILE, Close>;

File opened(const std::string& path, const char* mode) {
    File file(std::fopen(path.c_str(), mode));
    if (!file) {
        throw std::runtime_error("cannot open " + path);
    }
    return file;
}

std::size_t rowValues(const RawPicture& picture) {
    return std::size_t{picture.width} * static_cast<std::size_t>(picture.samples);
}

std::size_t rowBytes(const RawPicture& picture) {
    return rowValues(picture) * static_cast<std::size_t>(picture.bits / 8);
}

/// The rows as bytes, 16-bit samples in the machine's order.
std::vector<std::uint8_t> bytesOf(const RawPicture& picture) {
    if (picture.bits == 8) {
        return {picture.values.begin(), picture.values.end()};
    }
    std::vector<std::uint8_t> bytes(picture.values.size() * 2);
    std::memcpy(bytes.data(), picture.values.data(), bytes.size());
    return bytes;
}

void setRow(RawPicture& picture, std::uint32_t y, const std::uint8_t* bytes) {
    for (std::size_t at = 0; at < rowValues(picture); ++at) {
        std::uint16_t value = 0;
        std::memcpy(&value, bytes + at * static_cast<std::size_t>(picture.bits / 8),
                    static_cast<std::size_t>(picture.bits / 8));
        picture.values.at(y * rowValues(picture) + at) = value;
    }
}

} // namespace

RawPicture RawPicture::patterned(std::uint32_t width, std::uint32_t height, int bits, int samples) {
    RawPicture picture{.width = width, .height = height, .bits = bits, .samples = samples};
    const std::uint32_t mask = bits == 16 ? 0xFFFF : 0xFF;
    std::uint32_t value = 0;
    for (std::size_t count = width * height * static_cast<std::size_t>(samples); count > 0; --count) {
        picture.values.push_back(static_cast<std::uint16_t>(value >> 8 & mask));
        value = value * 40503 + 12345;
    }
    picture.values.back() = static_cast<std::uint16_t>(mask);
    return picture;
}

void writePng(const std::string& path, const RawPicture& picture) {
    const File file = opened(path, "wb");
    png_structp png = png_create_write_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
    png_infop info = png_create_info_struct(png);
    png_init_io(png, file.get());
    png_set_IHDR(png, info, picture.width, picture.height, picture.bits,
                 picture.samples == 4 ? PNG_COLOR_TYPE_RGBA : PNG_COLOR_TYPE_RGB, PNG_INTERLACE_NONE,
                 PNG_COMPRESSION_TYPE_DEFAULT, PNG_FILTER_TYPE_DEFAULT);
    auto bytes = bytesOf(picture);
    std::vector<png_bytep> rows;
    for (std::size_t y = 0; y < picture.height; ++y) {
        rows.push_back(bytes.data() + y * rowBytes(picture));
    }
    png_set_rows(png, info, rows.data());
    png_write_png(png, info, PNG_TRANSFORM_SWAP_ENDIAN, nullptr);
    png_destroy_write_struct(&png, &info);
}

RawPicture readPng(const std::string& path) {
    const File file = opened(path, "rb");
    png_structp png = png_create_read_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
    png_infop info = png_create_info_struct(png);
    png_init_io(png, file.get());
    png_read_png(png, info, PNG_TRANSFORM_SWAP_ENDIAN, nullptr);
    RawPicture picture{.width = png_get_image_width(png, info),
                       .height = png_get_image_height(png, info),
                       .bits = png_get_bit_depth(png, info),
                       .samples = png_get_channels(png, info)};
    picture.values.resize(rowValues(picture) * picture.height);
    for (std::uint32_t y = 0; y < picture.height; ++y) {
        setRow(picture, y, png_get_rows(png, info)[y]);
    }
    png_destroy_read_struct(&png, &info, nullptr);
    return picture;
}

void writeTiff(const std::string& path, const RawPicture& picture, const char* order) {
    TIFF* tiff = TIFFOpen(path.c_str(), (std::string("w") + order).c_str());
    TIFFSetField(tiff, TIFFTAG_IMAGEWIDTH, picture.width);
    TIFFSetField(tiff, TIFFTAG_IMAGELENGTH, picture.height);
    TIFFSetField(tiff, TIFFTAG_BITSPERSAMPLE, picture.bits);
    TIFFSetField(tiff, TIFFTAG_SAMPLESPERPIXEL, picture.samples);
    TIFFSetField(tiff, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_RGB);
    TIFFSetField(tiff, TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG);
    TIFFSetField(tiff, TIFFTAG_ORIENTATION, ORIENTATION_TOPLEFT);
    TIFFSetField(tiff, TIFFTAG_ROWSPERSTRIP, picture.height);
    if (picture.samples == 4) {
        const std::uint16_t alpha = picture.multiplied ? EXTRASAMPLE_ASSOCALPHA : EXTRASAMPLE_UNASSALPHA;
        TIFFSetField(tiff, TIFFTAG_EXTRASAMPLES, 1, &alpha);
    }
    auto bytes = bytesOf(picture);
    for (std::uint32_t y = 0; y < picture.height; ++y) {
        TIFFWriteScanline(tiff, bytes.data() + y * rowBytes(picture), y, 0);
    }
    TIFFClose(tiff);
}

RawPicture readTiff(const std::string& path) {
    TIFF* tiff = TIFFOpen(path.c_str(), "r");
    RawPicture picture;
    std::uint16_t bits = 0;
    std::uint16_t samples = 0;
    std::uint16_t extraSamples = 0;
    const std::uint16_t* alpha = nullptr;
    TIFFGetField(tiff, TIFFTAG_IMAGEWIDTH, &picture.width);
    TIFFGetField(tiff, TIFFTAG_IMAGELENGTH, &picture.height);
    TIFFGetField(tiff, TIFFTAG_BITSPERSAMPLE, &bits);
    TIFFGetField(tiff, TIFFTAG_SAMPLESPERPIXEL, &samples);
    picture.bits = bits;
    picture.samples = samples;
    picture.multiplied = TIFFGetField(tiff, TIFFTAG_EXTRASAMPLES, &extraSamples, &alpha) && extraSamples > 0 &&
                         alpha[0] == EXTRASAMPLE_ASSOCALPHA;
    picture.values.resize(rowValues(picture) * picture.height);
    std::vector<std::uint8_t> row(rowBytes(picture));
    for (std::uint32_t y = 0; y < picture.height; ++y) {
        TIFFReadScanline(tiff, row.data(), y, 0);
        setRow(picture, y, row.data());
    }
    TIFFClose(tiff);
    return picture;
}

void silenceTiff() {
    TIFFSetErrorHandler(nullptr);
    TIFFSetWarningHandler(nullptr);
}

void writeJpeg(const std::string& path, const RawPicture& picture) {
    const File file = opened(path, "wb");
    jpeg_compress_struct jpeg{};
    jpeg_error_mgr errors{};
    jpeg.err = jpeg_std_error(&errors);
    jpeg_create_compress(&jpeg);
    jpeg_stdio_dest(&jpeg, file.get());
    jpeg.image_width = picture.width;
    jpeg.image_height = picture.height;
    jpeg.input_components = picture.samples;
    jpeg.in_color_space = picture.samples == 1 ? JCS_GRAYSCALE : JCS_RGB;
    jpeg_set_defaults(&jpeg);
    jpeg_start_compress(&jpeg, TRUE);
    auto bytes = bytesOf(picture);
    for (std::size_t y = 0; y < picture.height; ++y) {
        JSAMPROW row = bytes.data() + y * rowBytes(picture);
        jpeg_write_scanlines(&jpeg, &row, 1);
    }
    jpeg_finish_compress(&jpeg);
    jpeg_destroy_compress(&jpeg);
}

RawPicture readJpeg(const std::string& path) {
    const File file = opened(path, "rb");
    jpeg_decompress_struct jpeg{};
    jpeg_error_mgr errors{};
    jpeg.err = jpeg_std_error(&errors);
    jpeg_create_decompress(&jpeg);
    jpeg_stdio_src(&jpeg, file.get());
    jpeg_read_header(&jpeg, TRUE);
    jpeg_start_decompress(&jpeg);
    RawPicture picture{.width = jpeg.output_width, .height = jpeg.output_height, .samples = jpeg.output_components};
    picture.values.resize(rowValues(picture) * picture.height);
    std::vector<std::uint8_t> bytes(rowBytes(picture));
    for (std::uint32_t y = 0; y < picture.height; ++y) {
        JSAMPROW row = bytes.data();
        jpeg_read_scanlines(&jpeg, &row, 1);
        setRow(picture, y, row);
    }
    jpeg_finish_decompress(&jpeg);
    jpeg_destroy_decompress(&jpeg);
    return picture;
}

} // namespace qivo
