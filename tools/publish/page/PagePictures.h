#pragma once

#include "tools/publish/Feeder.h"
#include "tools/publish/Handles.h"
#include "tools/publish/Stream.h"

#include <chrono>
#include <cstdint>
#include <functional>
#include <gst/app/gstappsink.h>
#include <memory>
#include <string>
#include <vector>

namespace qivo {

/** The newest picture of a source as JPEG, encoded only while somebody asks for it. Lives on the thread of the default
 *  main context. */
class PagePictures {
  public:
    /** The encoder rests once nobody has asked for so long. */
    static constexpr std::chrono::milliseconds patience{3000};

    /** Those who may wait at a time; whoever comes then is refused. */
    static constexpr std::size_t maximumWaiting = 32;

    /** `format`, in JPEG's colours, is that in which `make` makes pictures. */
    PagePictures(const PictureFormat& format, MakePictures make);
    ~PagePictures();
    PagePictures(const PagePictures&) = delete;
    PagePictures& operator=(const PagePictures&) = delete;

    /** Takes a picture and its number, which grows; no picture: none came in time, or too many wait. */
    using Taker = std::function<void(const std::string& jpeg, std::uint64_t number)>;

    /** Calls with a picture whose number is not `last`: at once if there is one, else when one comes. */
    void next(std::uint64_t last, Taker taker);

    /** Whether the encoder works. */
    [[nodiscard]] bool working() const { return m_pipeline != nullptr; }

  private:
    struct Waiting {
        Taker taker;
        std::chrono::steady_clock::time_point since;
    };

    [[nodiscard]] bool begin();
    void end();
    static GstFlowReturn onPicture(GstAppSink* sink, gpointer data);
    void takePicture();
    void handOut();
    void lookAround();

    const PictureFormat m_format;
    const MakePictures m_make;
    std::shared_ptr<PagePictures*> m_self = std::make_shared<PagePictures*>(this); // for news of pictures
    Object<GstElement> m_pipeline;
    Object<GstElement> m_sink;
    std::unique_ptr<Feeder> m_feeder;
    std::vector<Waiting> m_waiting;
    std::string m_newest;
    std::uint64_t m_number = 0; // of m_newest; 0: there is none
    std::uint64_t m_taken = 0;  // grows over rests, so that no picture has the number of an old one
    std::chrono::steady_clock::time_point m_asked;
    guint m_timer = 0;
};

} // namespace qivo
