#pragma once

#include "tools/publish/Sound.h"

#include <chrono>
#include <condition_variable>
#include <gst/app/gstappsrc.h>
#include <memory>
#include <mutex>
#include <thread>

namespace qivo {

/** Carries sound from a source to the live appsrc in front of an encoder, from the appsrc's first demand until
 *  destruction: a block whenever its time has passed, by the clock that paces the pictures, stamped with the pipeline's
 *  running time of its first sample. */
class SoundFeeder {
  public:
    static constexpr int blocksASecond = 100;

    SoundFeeder(GstAppSrc* destination, const SoundFormat& format, std::unique_ptr<SoundSource> source);
    ~SoundFeeder();
    SoundFeeder(const SoundFeeder&) = delete;
    SoundFeeder& operator=(const SoundFeeder&) = delete;

  private:
    using Time = std::chrono::steady_clock::time_point;

    void run();
    [[nodiscard]] bool waitUntil(Time time);
    void push(std::size_t count, Time taken);

    Object<GstAppSrc> m_destination;
    const SoundFormat m_format;
    const std::unique_ptr<SoundSource> m_source;
    std::mutex m_mutex;
    std::condition_variable m_changed;
    bool m_wanted = false;  // under m_mutex
    bool m_stopped = false; // under m_mutex
    std::thread m_thread;
};

} // namespace qivo
