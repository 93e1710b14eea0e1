#pragma once

#include <QWidget>

#include <initializer_list>
#include <memory>

namespace Ui {
class PTZPanel;
} // namespace Ui

namespace qivo {

class HoldButton;
class MotionKeys;
class PTZViewController;

/// The small window from which the user steers a camera: what its interface file describes, made and connected to its
/// controller. It stays above the window that it was opened from, forgets everything when it closes, and destroys
/// itself then.
///
/// Thread: main.
class PTZPanel : public QWidget {
    Q_OBJECT

  public:
    /// For the window that it is to stay above, which owns it.
    explicit PTZPanel(QWidget* parent);
    ~PTZPanel() override;

    PTZViewController& controller() { return *m_controller; }

    /// Shows the panel beside the window that it belongs to, or where that leaves no room, in its lower right corner.
    /// A panel that is shown already comes to the front and gets the keyboard.
    void present();

  protected:
    void keyPressEvent(QKeyEvent* event) override;

  private:
    void drawSymbols();
    void connectMotion();
    void connectKeys();
    static void pressHeld(std::initializer_list<HoldButton*> buttons);
    void connectFocusAndPresets();
    QPoint placeBesideParent() const;

    std::unique_ptr<Ui::PTZPanel> m_ui;
    std::unique_ptr<PTZViewController> m_controller;
    std::unique_ptr<MotionKeys> m_keys;
};

} // namespace qivo
