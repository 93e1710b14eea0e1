#pragma once

#include "tools/publish/Handles.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <filesystem>
#include <string>

namespace qivo::test {

/// A file made by a GStreamer pipeline that ends in a filesink "out"; goes with the test.
class MediaFile {
  public:
    MediaFile(const std::string& pipeline, const std::string& ending) {
        gst_init(nullptr, nullptr);
        std::string name = (std::filesystem::temp_directory_path() / "publish-XXXXXX").string();
        m_folder = mkdtemp(name.data());
        GstElement* parsed = gst_parse_launch((pipeline + " ! filesink name=out").c_str(), nullptr);
        const Object<GstElement> owned(GST_ELEMENT(gst_object_ref_sink(parsed)));
        const Object<GstElement> out(gst_bin_get_by_name(GST_BIN(parsed), "out"));
        m_path = m_folder / ("file" + ending);
        g_object_set(out.get(), "location", m_path.c_str(), nullptr);
        gst_element_set_state(parsed, GST_STATE_PLAYING);
        const Object<GstBus> bus(gst_element_get_bus(parsed));
        const Message end(gst_bus_timed_pop_filtered(bus.get(), 20 * GST_SECOND, GST_MESSAGE_EOS));
        EXPECT_TRUE(end);
        gst_element_set_state(parsed, GST_STATE_NULL);
    }
    ~MediaFile() { std::filesystem::remove_all(m_folder); }
    MediaFile(const MediaFile&) = delete;
    MediaFile& operator=(const MediaFile&) = delete;
    [[nodiscard]] std::string path() const { return m_path; }

  private:
    std::filesystem::path m_folder;
    std::filesystem::path m_path;
};

} // namespace qivo::test
