#include "app/AppDelegate.h"

#include "app/MainWindow.h"
#include "app/ViewController.h"
#include "platform/Application.h"
#include "platform/Log.h"
#include "platform/Resources.h"
#include "platform/UrlOpener.h"

#include <cstdio>

namespace qivo {
namespace {

/// Output may be a pipe that somebody watches, so that nothing is left in a buffer.
void print(const char* text) {
    std::fputs(text, stdout);
    std::fflush(stdout);
}

/// A page's address as it was configured, or else the one that ships with the application.
QUrl pageAddress(const char* configured, const char* shipped) {
    if (*configured != '\0') {
        return QUrl(QString::fromUtf8(configured));
    }
    return QUrl::fromLocalFile(QString::fromStdString(resourcePath()) + QStringLiteral("/pages/") +
                               QString::fromLatin1(shipped));
}

bool isWebAddress(const QUrl& url) {
    return url.isValid() && (url.scheme() == QLatin1String("http") || url.scheme() == QLatin1String("https"));
}

} // namespace

AppDelegate::AppDelegate() : m_theModel(AppData::inst()) {
    startQIVO();
}

AppDelegate::~AppDelegate() {
    QIVOlib_destroy();
}

bool AppDelegate::startQIVO() {
    if (!QIVOlib_initialize()) {
        print("Cannot run QIVO.");
        return false;
    }
    return true;
}

void AppDelegate::applicationDidFinishLaunching() {
    m_noAppNapActivity = std::make_unique<Activity>(QString::fromLatin1(kActivityReason));
    if (m_qivoSourcesMenu) {
        m_qivoSourcesMenu->applicationDidFinishLaunching();
    }
    m_audioPlayer = std::make_unique<AudioPlayback>();
    bindAudioPlayer();
}

/// The player's properties follow the model's: each is set now and after every change. A mute that the settings brought
/// back must silence the player before a source is chosen.
void AppDelegate::bindAudioPlayer() {
    connect(m_theModel, &AppData::muteChanged, this, [this] {
        if (m_audioPlayer) {
            m_audioPlayer->setMute(m_theModel->mute());
        }
    });
    // The notice comes under the model's lock, which a reader of the pair may take again.
    connect(m_theModel, &AppData::selectedQIVOSourceChangedCountChanged, this, [this] {
        if (m_audioPlayer) {
            m_audioPlayer->setSourceChangedCounter(m_theModel->selectedQIVOSourceChangedCount());
        }
    });
    m_audioPlayer->setMute(m_theModel->mute());
    m_audioPlayer->setSourceChangedCounter(m_theModel->selectedQIVOSourceChangedCount());
}

void AppDelegate::applicationWillTerminate() {
    if (m_audioPlayer) {
        m_audioPlayer->shutdown();
        m_audioPlayer.reset();
    }
    if (m_qivoSourcesMenu) {
        m_qivoSourcesMenu->applicationWillTerminate();
    }
    m_theModel->setIsRecording(false);
    m_theModel->serialize();
    m_noAppNapActivity.reset();
}

void AppDelegate::handleSelQIVOSource(const QAction* sender) {
    print("selected a QIVO source \n");
    if (sender == nullptr) {
        return;
    }
    const auto index = static_cast<std::int32_t>(sender->data().toLongLong());
    QString name;
    QString url;
    if (m_qivoSourcesMenu && m_qivoSourcesMenu->getQIVOFinderInfoAt(index, name, url)) {
        AppData::inst()->setQIVOSourceInfoNamed(name, url);
    }
}

void AppDelegate::gotoOrvaneHomePage() {
    openUrl(pageAddress(QIVO_HOME_PAGE, "home.html"));
}

void AppDelegate::gotoQIVOWebpage() {
    openUrl(pageAddress(QIVO_WEB_SITE, "qivo.html"));
}

void AppDelegate::gotoDeviceWebpage() {
    const QString page = m_theModel->deviceWebpageURL();
    if (page.isEmpty()) {
        return;
    }
    // The address comes from the network; anything but a web page could start a program.
    const QUrl url(page, QUrl::StrictMode);
    if (isWebAddress(url)) {
        openUrl(url);
    } else {
        logLine("The source's control page was not opened, since its address is not a web address: %s",
                qUtf8Printable(page));
    }
}

void AppDelegate::showPTZControl() {
    const auto* window = qobject_cast<MainWindow*>(mainWindow());
    if (window == nullptr) {
        return;
    }
    if (ViewController* controller = window->contentViewController()) {
        controller->performSegue(QStringLiteral("PTZSegue"), controller);
    }
}

void AppDelegate::handleSettingsMenuClick() {}

void AppDelegate::setRecordPath() {
    if (m_recordPathPanel) {
        m_recordPathPanel->raise();
        m_recordPathPanel->activateWindow();
        return;
    }
    m_recordPathPanel = makeRecordPathPanel().release(); // deletes itself when it has been closed
    connect(m_recordPathPanel, &QFileDialog::finished, this, [this, panel = m_recordPathPanel.data()](int response) {
        if (response == QDialog::Accepted) {
            takeRecordPath(panel->selectedFiles());
        }
    });
    m_recordPathPanel->open();
}

std::unique_ptr<QFileDialog> AppDelegate::makeRecordPathPanel() const {
    auto panel = std::make_unique<QFileDialog>(mainWindow(), QString::fromLatin1(kRecordPathMessage),
                                               m_theModel->recordingFolder());
    panel->setFileMode(QFileDialog::Directory);
    panel->setOption(QFileDialog::ShowDirsOnly);
    panel->setAttribute(Qt::WA_DeleteOnClose);
    return panel;
}

void AppDelegate::takeRecordPath(const QStringList& chosen) {
    if (!chosen.isEmpty() && !chosen.first().isEmpty()) {
        m_theModel->setRecordingFolder(chosen.first());
    }
}

bool AppDelegate::validateMenuItem(const QAction* item) const {
    return item->data().toInt() != kDeviceWebpageTag || m_theModel->hasDeviceWebpage();
}

} // namespace qivo
