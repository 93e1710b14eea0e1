#include "tools/record/MovieWriter.h"

#include <utility>

namespace qivo::record {
namespace {

constexpr Nanoseconds slowDisk = std::chrono::milliseconds(250);

} // namespace

Nanoseconds steadyNow() {
    return std::chrono::steady_clock::now().time_since_epoch();
}

MovieWriter::MovieWriter(MoviePlace place) : m_place(std::move(place)) {
    m_thread = std::thread([this] { run(); });
}

MovieWriter::~MovieWriter() {
    finish();
}

bool MovieWriter::push(Item item, std::size_t bytes, bool wait) {
    std::unique_lock lock(m_mutex);
    const auto closed = [this] { return m_finishing || !m_status.problem.empty(); };
    if (wait) {
        m_changed.wait(lock, [&] { return closed() || m_waiting < mostWaiting; });
    }
    if (closed() || m_waiting >= mostWaiting) {
        return false;
    }
    m_items.push_back(std::move(item));
    m_waiting += bytes;
    m_changed.notify_all();
    return true;
}

void MovieWriter::setPicture(PictureFormat format) {
    static_cast<void>(push(std::move(format), 0, true));
}

void MovieWriter::add(CodedPicture picture) {
    const std::size_t bytes = picture.bytes.size();
    static_cast<void>(push(std::move(picture), bytes, true));
}

bool MovieWriter::add(SoundPiece piece, const SoundFormat& format) {
    const std::size_t bytes = piece.bytes.size();
    return push(SoundItem{std::move(piece), format}, bytes, false);
}

void MovieWriter::finish() {
    {
        const std::lock_guard guard(m_mutex);
        m_finishing = true;
    }
    m_changed.notify_all();
    if (m_thread.joinable()) {
        m_thread.join();
    }
}

MovieWriter::Status MovieWriter::status() const {
    const std::lock_guard guard(m_mutex);
    Status status = m_status;
    status.diskIsSlow = m_writingSince && steadyNow() - *m_writingSince > slowDisk;
    return status;
}

void MovieWriter::run() {
    std::unique_lock lock(m_mutex);
    while (m_status.problem.empty()) {
        const auto ready = [this] { return m_finishing || !m_items.empty(); };
        if (const auto due = m_fragmenter.due()) {
            m_changed.wait_until(lock, std::chrono::steady_clock::time_point(*due), ready);
        } else {
            m_changed.wait(lock, ready);
        }
        std::deque<Item> items = std::exchange(m_items, {});
        m_waiting = 0;
        const bool last = m_finishing;
        lock.unlock();
        m_changed.notify_all();
        for (Item& item : items) {
            take(std::move(item));
        }
        write(last ? m_fragmenter.takeAll() : m_fragmenter.take(steadyNow()));
        if (last) {
            finishFile();
            return;
        }
        lock.lock();
    }
}

void MovieWriter::take(Item item) {
    if (auto* format = std::get_if<PictureFormat>(&item)) {
        m_picture = std::move(*format);
    } else if (auto* picture = std::get_if<CodedPicture>(&item)) {
        m_fragmenter.addPicture(std::move(*picture), steadyNow());
    } else if (auto* sound = std::get_if<SoundItem>(&item)) {
        m_fragmenter.addSound(std::move(sound->piece), sound->format, steadyNow());
    }
}

bool MovieWriter::open() {
    if (m_file) {
        return true;
    }
    std::string problem;
    FileHandle file = m_place.create(problem);
    if (!file) {
        fail(std::move(problem));
        return false;
    }
    m_file.emplace(std::move(file));
    return true;
}

void MovieWriter::write(const Fragment& fragment) {
    {
        const std::lock_guard guard(m_mutex);
        m_status.length = m_fragmenter.length();
        m_writingSince = steadyNow();
    }
    if ((!fragment.pictures.empty() || !fragment.sound.empty()) && open()) {
        if (m_picture) {
            m_file->setPicture(*m_picture);
        }
        if (m_fragmenter.soundFormat()) {
            m_file->setSound(*m_fragmenter.soundFormat());
        }
        if (!m_file->append(fragment)) {
            failWriting();
        }
    }
    const std::lock_guard guard(m_mutex);
    m_writingSince.reset();
    if (m_file && !m_file->isEmpty()) {
        m_status.pictures = m_file->tables().pictures.size();
        m_status.bytes = m_file->size();
    }
}

/// Of a movie without anything in it nothing is left behind.
void MovieWriter::failWriting() {
    if (m_file->isEmpty()) {
        m_place.takeBack();
        fail("cannot record to \"" + m_place.path() + "\": " + m_file->error());
        return;
    }
    fail("the movie \"" + m_place.path() + "\" ends here: " + m_file->error());
}

void MovieWriter::finishFile() {
    if (!m_file || !status().problem.empty()) {
        return;
    }
    if (!m_file->finish()) {
        fail("the movie \"" + m_place.path() + "\" is complete, but has no index: " + m_file->error());
    }
    const std::lock_guard guard(m_mutex);
    m_status.bytes = m_file->size();
    if (!m_file->tables().fitsIndex()) {
        m_status.remark = "the movie \"" + m_place.path() + "\" is too long for an index and stays in fragments";
    }
}

void MovieWriter::fail(std::string problem) {
    {
        const std::lock_guard guard(m_mutex);
        m_status.problem = std::move(problem);
    }
    m_changed.notify_all();
}

} // namespace qivo::record
