#include "ptz/PTZPanel.h"

#include "ptz/MotionKeys.h"
#include "ptz/PTZSymbol.h"
#include "ptz/PTZViewController.h"

#include "ui_PTZPanel.h"

#include <QKeyEvent>
#include <QScreen>

#include <algorithm>
#include <array>

namespace qivo {

PTZPanel::PTZPanel(QWidget* parent)
    : QWidget(parent, Qt::Tool), m_ui(std::make_unique<Ui::PTZPanel>()),
      m_controller(std::make_unique<PTZViewController>(this)) {
    setAttribute(Qt::WA_DeleteOnClose);
    m_ui->setupUi(this);
    drawSymbols();
    layout()->activate(); // the buttons have their sizes from here on
    m_controller->setZoomOutBtn(m_ui->zoomOut);
    m_controller->setStorePresetBtn(m_ui->storePreset);
    m_controller->viewDidLoad();
    connectMotion();
    connectKeys();
    connectFocusAndPresets();
}

/// Hiding first, so that what is still held is let go while there is somebody to tell it to.
PTZPanel::~PTZPanel() {
    hide();
}

void PTZPanel::drawSymbols() {
    const std::array<std::pair<QAbstractButton*, PTZSymbol>, 8> symbols = {{{m_ui->panLeft, PTZSymbol::left},
                                                                            {m_ui->panRight, PTZSymbol::right},
                                                                            {m_ui->tiltUp, PTZSymbol::up},
                                                                            {m_ui->tiltDown, PTZSymbol::down},
                                                                            {m_ui->zoomIn, PTZSymbol::zoomIn},
                                                                            {m_ui->zoomOut, PTZSymbol::zoomOut},
                                                                            {m_ui->autofocus, PTZSymbol::autofocus},
                                                                            {m_ui->storePreset, PTZSymbol::store}}};
    for (const auto& [button, symbol] : symbols) {
        button->setIcon(ptzIcon(symbol));
    }
}

/// A motion button sends its action when it is pressed and again when it is let go.
void PTZPanel::connectMotion() {
    PTZViewController* controller = m_controller.get();
    const auto connectButton = [controller](const HoldButton* button, void (PTZViewController::*action)()) {
        connect(button, &HoldButton::pressed, controller, action);
        connect(button, &HoldButton::released, controller, action);
    };
    connectButton(m_ui->zoomIn, &PTZViewController::DoZoomIn);
    connectButton(m_ui->zoomOut, &PTZViewController::DoZoomOut);
    connectButton(m_ui->panLeft, &PTZViewController::DoPanLeft);
    connectButton(m_ui->panRight, &PTZViewController::DoPanRight);
    connectButton(m_ui->tiltUp, &PTZViewController::DoTiltUp);
    connectButton(m_ui->tiltDown, &PTZViewController::DoTiltDown);
    for (const HoldButton* button : {m_ui->zoomIn, m_ui->zoomOut}) {
        connect(button, &HoldButton::interrupted, controller, [controller] { controller->zoomToward(0); });
    }
    for (const HoldButton* button : {m_ui->panLeft, m_ui->panRight, m_ui->tiltUp, m_ui->tiltDown}) {
        connect(button, &HoldButton::interrupted, controller, [controller] { controller->panTiltToward(0, 0); });
    }
}

void PTZPanel::connectKeys() {
    m_keys = std::make_unique<MotionKeys>(this);
    connect(m_keys.get(), &MotionKeys::panTilt, m_controller.get(), &PTZViewController::panTiltToward);
    connect(m_keys.get(), &MotionKeys::zoom, m_controller.get(), &PTZViewController::zoomToward);
    // What a key that is let go has stopped goes on where a button holds it, and the other way round. When the panel
    // has lost the keyboard nothing goes on.
    connect(m_keys.get(), &MotionKeys::panTilt, this, [this](int pan, int tilt) {
        if (pan == 0 && tilt == 0 && isActiveWindow()) {
            pressHeld({m_ui->panLeft, m_ui->panRight, m_ui->tiltUp, m_ui->tiltDown});
        }
    });
    connect(m_keys.get(), &MotionKeys::zoom, this, [this](int direction) {
        if (direction == 0 && isActiveWindow()) {
            pressHeld({m_ui->zoomIn, m_ui->zoomOut});
        }
    });
    for (const HoldButton* button : findChildren<HoldButton*>()) {
        connect(button, &HoldButton::released, m_keys.get(), &MotionKeys::tellAgain);
    }
    connect(m_keys.get(), &MotionKeys::preset, this, [this](int number) {
        for (QAbstractButton* button : m_ui->presets->buttons()) {
            if (button->property("tag").toInt() == number) {
                button->click();
            }
        }
    });
}

void PTZPanel::pressHeld(std::initializer_list<HoldButton*> buttons) {
    for (HoldButton* button : buttons) {
        if (button->isDown()) {
            emit button->pressed();
        }
    }
}

/// The slider also counts when it is grabbed where it stands, which takes the focus back from the camera's automatic.
void PTZPanel::connectFocusAndPresets() {
    PTZViewController* controller = m_controller.get();
    const auto sendFocus = [this] { m_controller->DoFocusSlider(m_ui->focus); };
    connect(m_ui->focus, &QSlider::valueChanged, controller, sendFocus);
    connect(m_ui->focus, &QSlider::sliderPressed, controller, sendFocus);
    connect(m_ui->autofocus, &QAbstractButton::clicked, controller, &PTZViewController::DoAutofocus);
    connect(m_ui->presets, &QButtonGroup::buttonClicked, controller, &PTZViewController::DoPresetButton);
}

void PTZPanel::present() {
    if (!isVisible()) {
        adjustSize();
        move(placeBesideParent());
    }
    show();
    setWindowState(windowState() & ~Qt::WindowMinimized);
    raise();
    activateWindow();
}

QPoint PTZPanel::placeBesideParent() const {
    constexpr int kGap = 12; // pixels of the toolkit
    const QRect window = parentWidget()->frameGeometry();
    const QRect screen = parentWidget()->screen()->availableGeometry();
    const int titleBar = parentWidget()->geometry().top() - window.top(); // the panel's will be no higher
    const int beside = window.right() + kGap;
    if (beside + width() <= screen.right()) {
        return {beside, window.top()};
    }
    return {std::min(window.right(), screen.right()) - width() - kGap,
            std::max(screen.top(), std::min(window.bottom(), screen.bottom()) - titleBar - height() - kGap)};
}

void PTZPanel::keyPressEvent(QKeyEvent* event) {
    if (event->matches(QKeySequence::Cancel)) {
        close();
    } else {
        QWidget::keyPressEvent(event);
    }
}

} // namespace qivo
