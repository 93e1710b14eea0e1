#include "app/AppData.h"

#include "platform/Application.h"

#include <QCoreApplication>
#include <QDir>
#include <QFileInfo>

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

AppData::~AppData() = default;

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
    m_isRecording = isRecording;
    emit isRecordingChanged();
}

} // namespace qivo
