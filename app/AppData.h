#pragma once

#include "platform/CancellableThread.h"
#include "platform/Preferences.h"
#include "sdk/qivo.h"

#include <QObject>
#include <QString>
#include <QStringList>

#include <atomic>
#include <cstdint>
#include <memory>
#include <mutex>
#include <stop_token>

Q_DECLARE_OPAQUE_POINTER(QIVOlib_recv_instance_t)

namespace qivo {

/// The model that every part of the application shares: the selected source, the user's switches, and what the
/// connected source has told about itself.
///
/// A property's notify signal is sent on every call of its setter, also when the value stays. "hasPTZControl" is the
/// exception: it is announced only by `clearPTZSource`, and only when there was something to clear. Strings are null
/// where nothing was ever set, which differs from empty.
///
/// Thread: the switches, the page address, the counter and `ptzSource` may be read and written from any thread; name,
/// URL and counter are written on the main thread under one lock and read together, from any thread, through
/// `getQIVOSourceInfoNamed`. Everything else belongs to the main thread. A signal is sent on the thread that made the
/// change, so that a slot of an object of another thread is queued for it.
class AppData : public QObject {
    Q_OBJECT
    Q_PROPERTY(bool isLowBandwidth READ isLowBandwidth WRITE setIsLowBandwidth NOTIFY isLowBandwidthChanged)
    Q_PROPERTY(bool mute READ mute WRITE setMute NOTIFY muteChanged)
    Q_PROPERTY(QString deviceWebpageURL READ deviceWebpageURL WRITE setDeviceWebpageURL NOTIFY deviceWebpageURLChanged)
    Q_PROPERTY(bool hasDeviceWebpage READ hasDeviceWebpage)
    Q_PROPERTY(QString selectedQIVOSourceName READ selectedQIVOSourceName)
    Q_PROPERTY(QString selectedQIVOSourceURL READ selectedQIVOSourceURL)
    Q_PROPERTY(int selectedQIVOSourceChangedCount READ selectedQIVOSourceChangedCount WRITE
                   setSelectedQIVOSourceChangedCount NOTIFY selectedQIVOSourceChangedCountChanged)
    Q_PROPERTY(bool hasPTZControl READ hasPTZControl NOTIFY hasPTZControlChanged)
    Q_PROPERTY(QIVOlib_recv_instance_t ptzSource READ ptzSource WRITE setPtzSource)
    Q_PROPERTY(QString recordingFolder READ recordingFolder WRITE setRecordingFolder NOTIFY recordingFolderChanged)
    Q_PROPERTY(bool isRecording READ isRecording WRITE setIsRecording NOTIFY isRecordingChanged)

  public:
    static constexpr const char* kLowBandwidthKey = "ORVQIVOViewer_isLowBandwith"; // spelled as settings were saved
    static constexpr const char* kMuteKey = "ORVQIVOViewer_mute";
    static constexpr const char* kRecordFolderKey = "ORVQIVOViewer_recordFolder";

    /// The program that records.
    static constexpr const char* kRecorderPath = "/usr/local/bin/Application.Mac.QIVO.Recording";
    /// How often `stopRecording` looks whether the recorder has ended, in milliseconds.
    static constexpr int kRecordingPollMs = 5;

    /// The shared model, made by the first call and never destroyed. Safe from any thread. It belongs to the main
    /// thread if an application object exists by then.
    static AppData* inst();

    /// A model of its own with the user's preferences, or with the given ones, whose settings it loads.
    AppData();
    explicit AppData(std::unique_ptr<Preferences> preferences);
    ~AppData() override;

    /// Writes the three settings back. The application does so once, when it terminates.
    void serialize();

    /// The user wants the source's low-bandwidth stream.
    bool isLowBandwidth() const { return m_isLowBandwidth; }
    void setIsLowBandwidth(bool isLowBandwidth);

    /// Sound is silenced.
    bool mute() const { return m_mute; }
    void setMute(bool mute);

    /// The connected source's web control page; empty when the connection was dropped, null before any.
    QString deviceWebpageURL() const;
    void setDeviceWebpageURL(const QString& deviceWebpageURL);
    bool hasDeviceWebpage() const { return !deviceWebpageURL().isEmpty(); }

    /// Name and URL of the selected source, without the lock: for the main thread, which alone writes them.
    QString selectedQIVOSourceName() const { return m_selectedQIVOSourceName; }
    QString selectedQIVOSourceURL() const { return m_selectedQIVOSourceURL; }

    /// Goes up by one on every selection, from 0.
    std::int32_t selectedQIVOSourceChangedCount() const { return m_selectedQIVOSourceChangedCount; }
    void setSelectedQIVOSourceChangedCount(std::int32_t count);

    /// Copies of the selected source's name and URL that belong together; null before the first selection.
    void getQIVOSourceInfoNamed(QString& named, QString& locatedAt) const;

    /// Selects a source: forgets the PTZ source, stores name and URL and raises the counter under the lock, whose
    /// observers are told while it is held (it is recursive, so they may read the pair), titles the main window, and
    /// ends a recording. Selecting the selected source again does all of it. Main thread.
    void setQIVOSourceInfoNamed(const QString& named, const QString& locatedAt);

    bool hasPTZControl() const { return ptzSource() != nullptr; }

    /// The receiver that takes PTZ commands, borrowed; null if there is none. Setting it tells nobody.
    QIVOlib_recv_instance_t ptzSource() const { return m_ptzSource; }
    void setPtzSource(QIVOlib_recv_instance_t ptzSource) { m_ptzSource = ptzSource; }

    /// Forgets the PTZ source and announces "hasPTZControl"; without one, does nothing.
    void clearPTZSource();

    /// Where recordings are written.
    QString recordingFolder() const { return m_recordingFolder; }
    void setRecordingFolder(const QString& recordingFolder);

    /// A recording is wanted. A change starts or stops the recorder before it is announced. That the recorder runs is
    /// not said: it may have ended by itself, or never have begun for lack of a source, a folder or the program.
    bool isRecording() const { return m_isRecording; }
    void setIsRecording(bool isRecording);

    /// Starts the recorder for the selected source, after having stopped the one that runs. Without a source or a
    /// folder nothing starts. Name and folder are copied: what changes later does not touch this recording.
    void startRecording();

    /// Tells the recorder to end and waits until it has, which is up to the recorder: it is interrupted each time that
    /// it has written to its standard output, until it exits. Returns at once if none runs.
    void stopRecording();

    /// The recording thread: runs the recorder for a source (the first of the two) into a folder (the second), until
    /// the recorder exits. A recorder that cannot be launched ends it at once, without a word.
    ///
    /// Thread: any; nothing of the model is changed or read but the recorder's path.
    void recordThreadProc(const QStringList& sourceAndFolder, const std::stop_token& cancelled) const;

    /// Has another program record in the place of the installed one. For tests; not while a recorder runs.
    void setRecorderPath(const QString& path) { m_recorderPath = path; }

  signals:
    void isLowBandwidthChanged();
    void muteChanged();
    void deviceWebpageURLChanged();
    void selectedQIVOSourceChangedCountChanged();
    void hasPTZControlChanged();
    void recordingFolderChanged();
    void isRecordingChanged();

  private:
    std::atomic<bool> m_isLowBandwidth = false;
    std::atomic<bool> m_mute = false;
    std::atomic<std::int32_t> m_selectedQIVOSourceChangedCount = 0;
    std::atomic<QIVOlib_recv_instance_t> m_ptzSource = nullptr;

    mutable std::mutex m_webpageMutex; // protects m_deviceWebpageURL
    QString m_deviceWebpageURL;

    mutable std::recursive_mutex m_sourceMutex; // protects the pair; the main thread alone may read it without
    QString m_selectedQIVOSourceName;
    QString m_selectedQIVOSourceURL;

    // Main thread only.
    std::unique_ptr<Preferences> m_preferences;
    QString m_recordingFolder;
    bool m_isRecording = false;
    QString m_recorderPath = QString::fromLatin1(kRecorderPath); // read by the recording thread while there is one
    std::unique_ptr<CancellableThread> m_recordingThread;
};

} // namespace qivo
