#include "app/AppData.h"

#include "platform/Application.h"
#include "platform/Task.h"

#include <QCoreApplication>
#include <QDir>
#include <QFileInfo>

#include <chrono>
#include <thread>
#include <utility>

namespace qivo {
namespace {

QString defaultRecordingFolder() {
    const QString home = QDir::homePath();
    const QString movies = QStringLiteral("%1/Movies").arg(home);
    return QFileInfo(movies).isDir() ? movies : home;
}

/// Made by whichever thread asks first, but it belongs to the main thread.
AppData* makeShared() {
    auto model = std::make_unique<AppData>();
    if (QCoreApplication* application = QCoreApplication::instance()) {
        model->moveToThread(application->thread());
    }
    return model.release();
}

} // namespace

AppData* AppData::inst() {
    static AppData* const shared = makeShared();
    return shared;
}

AppData::AppData() : AppData(std::make_unique<Preferences>()) {}

AppData::AppData(std::unique_ptr<Preferences> preferences) : m_preferences(std::move(preferences)) {
    m_isLowBandwidth = m_preferences->boolForKey(QLatin1String(kLowBandwidthKey)).value_or(false);
    m_mute = m_preferences->boolForKey(QLatin1String(kMuteKey)).value_or(false);
    m_recordingFolder = defaultRecordingFolder();
    const QString stored = m_preferences->stringForKey(QLatin1String(kRecordFolderKey)).value_or(QString());
    if (!stored.isEmpty()) {
        m_recordingFolder = stored;
    }
}

AppData::~AppData() {
    stopRecording();
}

void AppData::serialize() {
    m_preferences->setBool(isLowBandwidth(), QLatin1String(kLowBandwidthKey));
    m_preferences->setBool(mute(), QLatin1String(kMuteKey));
    m_preferences->setString(recordingFolder(), QLatin1String(kRecordFolderKey));
}

void AppData::setIsLowBandwidth(bool isLowBandwidth) {
    m_isLowBandwidth = isLowBandwidth;
    emit isLowBandwidthChanged();
}

void AppData::setMute(bool mute) {
    m_mute = mute;
    emit muteChanged();
}

QString AppData::deviceWebpageURL() const {
    const std::lock_guard guard(m_webpageMutex);
    return m_deviceWebpageURL;
}

void AppData::setDeviceWebpageURL(const QString& deviceWebpageURL) {
    {
        const std::lock_guard guard(m_webpageMutex);
        m_deviceWebpageURL = deviceWebpageURL;
    }
    emit deviceWebpageURLChanged();
}

void AppData::setSelectedQIVOSourceChangedCount(std::int32_t count) {
    m_selectedQIVOSourceChangedCount = count;
    emit selectedQIVOSourceChangedCountChanged();
}

void AppData::getQIVOSourceInfoNamed(QString& named, QString& locatedAt) const {
    const std::lock_guard guard(m_sourceMutex);
    named = m_selectedQIVOSourceName;
    locatedAt = m_selectedQIVOSourceURL;
}

void AppData::setQIVOSourceInfoNamed(const QString& named, const QString& locatedAt) {
    clearPTZSource();
    {
        const std::lock_guard guard(m_sourceMutex);
        m_selectedQIVOSourceName = named;
        m_selectedQIVOSourceURL = locatedAt;
        // Unsigned, so that the step past the largest value is defined.
        const auto next = static_cast<std::uint32_t>(selectedQIVOSourceChangedCount()) + 1U;
        setSelectedQIVOSourceChangedCount(static_cast<std::int32_t>(next));
    }
    setMainWindowTitle(named);
    setIsRecording(false);
}

void AppData::clearPTZSource() {
    // One exchange, so that of two threads that clear at once only one announces it.
    if (m_ptzSource.exchange(nullptr) != nullptr) {
        emit hasPTZControlChanged();
    }
}

void AppData::setRecordingFolder(const QString& recordingFolder) {
    m_recordingFolder = recordingFolder;
    emit recordingFolderChanged();
}

void AppData::setIsRecording(bool isRecording) {
    if (m_isRecording != isRecording) {
        m_isRecording = isRecording;
        if (isRecording) {
            startRecording();
        } else {
            stopRecording();
        }
    }
    emit isRecordingChanged();
}

void AppData::startRecording() {
    stopRecording();
    if (m_selectedQIVOSourceName.isEmpty() || m_recordingFolder.isEmpty()) {
        return;
    }
    m_recordingThread = std::make_unique<CancellableThread>(
        [this, sourceAndFolder = QStringList{m_selectedQIVOSourceName, m_recordingFolder}](
            const std::stop_token& cancelled) { recordThreadProc(sourceAndFolder, cancelled); });
}

void AppData::stopRecording() {
    if (!m_recordingThread) {
        return;
    }
    m_recordingThread->cancel();
    while (m_recordingThread->isExecuting()) {
        std::this_thread::sleep_for(std::chrono::milliseconds(kRecordingPollMs));
    }
    m_recordingThread.reset();
}

void AppData::recordThreadProc(const QStringList& sourceAndFolder, const std::stop_token& cancelled) const {
    const QString& source = sourceAndFolder.at(0);
    const QString movie = sourceAndFolder.at(1) + QLatin1Char('/') + source + QLatin1String(".mov");
    const auto recorder = Task::launch(m_recorderPath.toStdString(), {"-i", source.toStdString(), "-o",
                                                                      movie.toStdString(), "-orvane", "-nothumbnail"});
    while (recorder && recorder->isRunning()) {
        // What it says is for people who run it by hand; here it only has to be taken.
        const bool outputHasEnded = recorder->readOutput().empty();
        if (cancelled.stop_requested()) {
            recorder->interrupt();
        }
        if (outputHasEnded) {
            // Nothing holds the next pass up any more, and it would come at once.
            std::this_thread::sleep_for(std::chrono::milliseconds(kRecordingPollMs));
        }
    }
}

} // namespace qivo
