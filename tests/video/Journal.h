#pragma once

#include "platform/DisplayLink.h"
#include "platform/FairLock.h"
#include "platform/GLContext.h"
#include "platform/PixelFormat.h"
#include "tests/fake/FakeQivo.h"
#include "tests/gl/RecordingGL.h"

#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

namespace qivo::test {

/// One account of what a view does to GL, its context, its link and libqivo, in the order in which it happens.
///
/// Thread: one.
class Journal {
  public:
    Journal() {
        FakeQivo::instance().setHook([this](const std::string& line) { add(line); });
    }
    ~Journal() { FakeQivo::instance().setHook(nullptr); }
    Journal(const Journal&) = delete;
    Journal& operator=(const Journal&) = delete;

    void add(const std::string& line) {
        collect();
        m_lines.push_back(line);
    }

    /// Everything since the last time.
    std::vector<std::string> take() {
        collect();
        return std::exchange(m_lines, {});
    }

    /// The same without the GL calls.
    std::vector<std::string> takeWithoutGL() {
        auto lines = take();
        std::erase_if(lines, [](const std::string& line) { return line.starts_with("gl"); });
        return lines;
    }

    RecordingGL gl;

  private:
    void collect() {
        for (auto& line : gl.take()) {
            m_lines.push_back(std::move(line));
        }
    }

    std::vector<std::string> m_lines;
};

/// A context that only tells.
class JournalContext final : public GLContext {
  public:
    explicit JournalContext(Journal& journal) : m_journal(journal) {}
    void makeCurrentContext() override { m_journal.add("makeCurrentContext"); }
    void setSwapInterval(int interval) override { m_journal.add("setSwapInterval " + std::to_string(interval)); }
    void lock() override { m_journal.add("lock"); }
    void unlock() override { m_journal.add("unlock"); }
    void flushDrawable() override { m_journal.add("flushDrawable"); }
    void afterNextFlush(std::function<void()> done) override {
        m_journal.add("afterNextFlush");
        afterFlush = std::move(done);
    }
    std::shared_ptr<const DisplayRefresh> display() const override { return m_display; }

    std::function<void()> afterFlush;

  private:
    Journal& m_journal;
    std::shared_ptr<DisplayRefresh> m_display = std::make_shared<DisplayRefresh>();
};

/// A link that only tells, and refreshes when it is told to.
class JournalLink final : public DisplayLink {
  public:
    explicit JournalLink(Journal& journal) : m_journal(journal) { m_journal.add("link made"); }
    ~JournalLink() override { m_journal.add("link released"); }
    void setOutputCallback(OutputCallback callback, void* context) override {
        m_journal.add("link callback");
        m_callback = callback;
        m_context = context;
    }
    void setCurrentDisplayFromContext(const GLContext& context, const PixelFormat& format) override {
        m_journal.add("link display");
        followed = &context;
        followedFormat = format.attributes();
    }
    void start() override {
        m_journal.add("link start");
        m_running = true;
    }
    void stop() override {
        m_journal.add("link stop");
        m_running = false;
    }
    bool isRunning() const override { return m_running; }
    int refresh() { return m_callback(this, {}, m_context); }

    const GLContext* followed = nullptr;
    std::vector<std::uint32_t> followedFormat;

  private:
    Journal& m_journal;
    OutputCallback m_callback = nullptr;
    void* m_context = nullptr;
    bool m_running = false;
};

} // namespace qivo::test
