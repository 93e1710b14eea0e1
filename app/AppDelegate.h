#pragma once

#include "app/AppData.h"
#include "audio/AudioPlayback.h"
#include "discovery/QIVOFileMenu.h"
#include "platform/Activity.h"

#include <QAction>
#include <QFileDialog>
#include <QObject>
#include <QPointer>

#include <memory>

namespace qivo {

/// The application's controller: starts and stops the QIVO library and what depends on it, in a fixed order, and
/// answers the menu's commands. The library is initialised when the controller is made and destroyed when it goes, so
/// it must outlive everything else that calls the library.
///
/// Thread: main.
class AppDelegate : public QObject {
    Q_OBJECT

  public:
    /// The tag of commands that need the connected source's web page.
    static constexpr int kDeviceWebpageTag = -1;
    static constexpr const char* kActivityReason = "realtime UDP receiving";
    static constexpr const char* kRecordPathMessage = "Choose the directory for recordings.";

    AppDelegate();
    ~AppDelegate() override;

    AppData* theModel() const { return m_theModel; }

    /// Initialises the QIVO library. Where it cannot run, says so on standard output and answers false; the
    /// application goes on without sources.
    bool startQIVO();

    void applicationDidFinishLaunching();
    void applicationWillTerminate();
    bool applicationShouldTerminateAfterLastWindowClosed() const { return true; }

    /// The player of the selected source's sound; null before launch completion and after termination.
    AudioPlayback* audioPlayer() const { return m_audioPlayer.get(); }

    /// Selects the source that an item of the sources menu stands for. Ignored if it is in the list no more.
    void handleSelQIVOSource(const QAction* sender);

    void gotoOrvaneHomePage();
    void gotoQIVOWebpage();
    /// Opens the connected source's control page, if it has one that a browser shows (http or https).
    void gotoDeviceWebpage();
    void showPTZControl();
    void handleSettingsMenuClick();

    /// Has the user choose the folder for recordings, in a panel that belongs to the main window, if there is one. It
    /// returns at once; the model learns of the folder when the user has chosen. A panel that is open comes forward.
    void setRecordPath();

    /// Whether a command of the menu is to be enabled.
    bool validateMenuItem(const QAction* item) const;

    QIVOFileMenu* qivoSourcesMenu() const { return m_qivoSourcesMenu; }
    void setQivoSourcesMenu(QIVOFileMenu* menu) { m_qivoSourcesMenu = menu; }

  private:
    void bindAudioPlayer();
    std::unique_ptr<QFileDialog> makeRecordPathPanel() const;
    void takeRecordPath(const QStringList& chosen);

    AppData* m_theModel;
    std::unique_ptr<AudioPlayback> m_audioPlayer;
    std::unique_ptr<Activity> m_noAppNapActivity;
    QPointer<QIVOFileMenu> m_qivoSourcesMenu;
    QPointer<QFileDialog> m_recordPathPanel; // while it is open
};

} // namespace qivo
