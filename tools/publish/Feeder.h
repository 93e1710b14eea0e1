#pragma once

#include "tools/publish/PictureSource.h"

#include <condition_variable>
#include <gst/app/gstappsrc.h>
#include <memory>
#include <mutex>
#include <optional>
#include <thread>

namespace qivo {

/** Carries pictures from a source to the live appsrc in front of an encoder, from the appsrc's first demand, which
 * comes when its pipeline plays, until destruction. Stamps them with the pipeline's running time at which they were
 * taken; of those that were taken before it played only the first is carried. */
class Feeder {
  public:
    Feeder(GstAppSrc* destination, std::unique_ptr<PictureSource> source);
    ~Feeder();
    Feeder(const Feeder&) = delete;
    Feeder& operator=(const Feeder&) = delete;

    /** Ends the feeding; waits for the thread. */
    void stop();

  private:
    void run();
    void push(Picture picture);

    Object<GstAppSrc> m_destination;
    std::unique_ptr<PictureSource> m_source;
    std::mutex m_mutex;
    std::condition_variable m_changed;
    GstClockTime m_base = 0;                // the time of the clock when the pipeline's running time was 0
    std::optional<GstClockTimeDiff> m_last; // since then, the stamp of the last picture
    bool m_wanted = false;                  // under m_mutex
    bool m_stopped = false;                 // under m_mutex
    std::thread m_thread;
};

} // namespace qivo
