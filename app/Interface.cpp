#include "app/Interface.h"

#include "app/Binding.h"
#include "app/MainWindow.h"
#include "app/SwitchIcon.h"
#include "app/ViewController.h"
#include "app/WindowController.h"
#include "platform/Application.h"
#include "ptz/PTZPanel.h"

#include "ui_MainWindow.h"
#include "ui_TitleBarAccessory.h"

#include <QApplication>

namespace qivo {

Interface::Interface()
    : m_delegate(std::make_unique<AppDelegate>()), m_ui(std::make_unique<Ui::MainWindow>()),
      m_window(std::make_unique<MainWindow>()), m_viewController(std::make_unique<ViewController>()),
      m_windowController(std::make_unique<WindowController>(m_window.get())) {
    m_ui->setupUi(m_window.get());
    setMainWindow(m_window.get());
    m_window->setContentViewController(m_viewController.get());
    loadMenus();
    loadTitleBar();
    loadSegues();
    m_viewController->viewDidLoad();
    m_windowController->windowDidLoad();
}

/// A window that goes open closes its receiver, which the model announces when the menus' commands have gone already.
Interface::~Interface() {
    m_delegate->theModel()->disconnect(this);
}

PTZPanel* Interface::ptzPanel() const {
    return m_ptzPanel && m_ptzPanel->isVisible() ? m_ptzPanel.data() : nullptr;
}

void Interface::terminate() {
    QCoreApplication::exit();
}

void Interface::loadMenus() {
    takeTags();
    m_delegate->setQivoSourcesMenu(m_ui->menuSources);
    connect(m_ui->menuSources, &QIVOFileMenu::handleSelQIVOSource, m_delegate.get(), &AppDelegate::handleSelQIVOSource);
    connect(m_ui->menuSources, &QIVOFileMenu::updated, this, [this] { validateMenu(m_ui->menuSources); });
    addCommand(m_ui->actionHomePage, &AppDelegate::gotoOrvaneHomePage);
    addCommand(m_ui->actionQIVOWebSite, &AppDelegate::gotoQIVOWebpage);
    addCommand(m_ui->actionSettings, &AppDelegate::handleSettingsMenuClick);
    addCommand(m_ui->actionWebControlPage, &AppDelegate::gotoDeviceWebpage);
    addCommand(m_ui->actionCameraControl, &AppDelegate::showPTZControl);
    addCommand(m_ui->actionRecordingFolder, &AppDelegate::setRecordPath);
    connect(m_ui->actionQuit, &QAction::triggered, this, &Interface::terminate, Qt::QueuedConnection);
    connect(m_ui->actionFullScreen, &QAction::triggered, m_window.get(), &MainWindow::setFullScreen);
    connect(m_ui->actionLeaveFullScreen, &QAction::triggered, m_window.get(),
            [this] { m_window->setFullScreen(false); });
    connect(m_window.get(), &MainWindow::fullScreenChanged, m_ui->actionFullScreen, &QAction::setChecked);
    connect(m_window.get(), &MainWindow::fullScreenChanged, m_ui->actionLeaveFullScreen, &QAction::setEnabled);
    connect(m_delegate->theModel(), &AppData::deviceWebpageURLChanged, this, &Interface::validateAllMenus);
    validateAllMenus();
}

/// A tag in the interface file becomes the action's data.
void Interface::takeTags() {
    const auto menus = m_ui->menuBar->findChildren<QMenu*>(QString(), Qt::FindDirectChildrenOnly);
    for (QMenu* menu : menus) {
        for (QAction* item : menu->actions()) {
            const QVariant tag = item->property("tag");
            if (tag.isValid()) {
                item->setData(tag);
            }
        }
        connect(menu, &QMenu::aboutToShow, this, [this, menu] { validateMenu(menu); });
    }
}

void Interface::addCommand(QAction* item, void (AppDelegate::*command)()) {
    m_commands.append(item);
    connect(item, &QAction::triggered, m_delegate.get(), command);
}

void Interface::validateMenu(QMenu* menu) const {
    for (QAction* item : menu->actions()) {
        if (m_commands.contains(item)) {
            item->setEnabled(m_delegate->validateMenuItem(item));
        }
    }
}

/// Keys reach commands while no menu is open, so that these must be right at all times.
void Interface::validateAllMenus() const {
    for (QAction* item : m_commands) {
        item->setEnabled(m_delegate->validateMenuItem(item));
    }
}

void Interface::loadTitleBar() {
    auto view = std::make_unique<QWidget>();
    Ui::TitleBarAccessory ui;
    ui.setupUi(view.get());
    ui.recordSwitch->setIcon(switchIcon(SwitchSymbol::record));
    ui.muteSwitch->setIcon(switchIcon(SwitchSymbol::mute));
    ui.lowBandwidthSwitch->setIcon(switchIcon(SwitchSymbol::lowBandwidth));
    AppData* model = m_windowController->getTheModel();
    bindSwitch(ui.recordSwitch, model, {&AppData::isRecording, &AppData::setIsRecording, &AppData::isRecordingChanged});
    bindSwitch(ui.muteSwitch, model, {&AppData::mute, &AppData::setMute, &AppData::muteChanged});
    bindSwitch(ui.lowBandwidthSwitch, model,
               {&AppData::isLowBandwidth, &AppData::setIsLowBandwidth, &AppData::isLowBandwidthChanged});
    for (QToolButton* control : {ui.recordSwitch, ui.muteSwitch, ui.lowBandwidthSwitch}) {
        // No higher than the menus' titles, which would else stand apart from their menus.
        control->setFixedHeight(m_ui->menuBar->sizeHint().height());
    }
    m_windowController->setAccessoryView(std::move(view));
}

void Interface::loadSegues() {
    connect(m_viewController.get(), &ViewController::seguePerformed, this, [this](const QString& identifier) {
        if (identifier == QLatin1String("PTZSegue")) {
            showPTZPanel();
        }
    });
    // Connected before the controller's termination, which may take its time: no camera is left moving meanwhile.
    connect(qApp, &QCoreApplication::aboutToQuit, this, [this] {
        if (m_ptzPanel) {
            m_ptzPanel->close();
        }
    });
}

/// One panel at a time: asked for again, it comes to the front.
void Interface::showPTZPanel() {
    if (ptzPanel() == nullptr) {
        m_ptzPanel = std::make_unique<PTZPanel>(m_window.get()).release(); // the window owns it
        connect(m_window.get(), &MainWindow::willClose, m_ptzPanel, &QWidget::close);
    }
    m_ptzPanel->present();
}

} // namespace qivo
