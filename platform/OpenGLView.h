#pragma once

#include "platform/GLContext.h"
#include "platform/Geometry.h"
#include "platform/PixelFormat.h"

#include <QPointer>
#include <QWidget>
#include <memory>

class QScreen;
class QWindow;

namespace qivo {

class WindowGLContext;

/// A widget that shows what OpenGL draws, in a window of the window system of its own inside the widget.
///
/// That inner window lets pointer and keyboard through to the widget, so that the main window keeps its menus,
/// shortcuts and focus wherever the user clicks. The widget itself is painted black: where the drawable has alpha and a
/// compositor blends it (as Wayland's do with sub-surfaces), what shines through is black and opaque.
///
/// The context is made when the inner window is first shown; then prepareOpenGL() and reshape() are called, with the
/// context's lock held. If there is no such context, the view stays black and none of the GL operations is called.
///
/// Thread: main, except where a subclass allows more.
class OpenGLView : public QWidget {
    Q_OBJECT

  public:
    OpenGLView(QWidget* parent, const PixelFormat& pixelFormat);
    ~OpenGLView() override;

    /// Asks for nothing in particular.
    static PixelFormat defaultPixelFormat();
    const PixelFormat& pixelFormat() const { return m_pixelFormat; }

    /// Null until there is one.
    GLContext* openGLContext() const { return m_openGLContext.get(); }
    /// Gives the view a context in the place of the one that it would make.
    void setOpenGLContext(std::shared_ptr<GLContext> context);

    /// A rectangle of the widget in pixels of the drawable.
    virtual Rect convertRectToBacking(const Rect& rect) const;
    /// The widget's own rectangle, in the widget's units.
    Rect bounds() const;
    /// The drawable always has the screen's full resolution here; the wish is only remembered.
    void setWantsBestResolutionOpenGLSurface(bool wants) { m_wantsBestResolution = wants; }
    bool wantsBestResolutionOpenGLSurface() const { return m_wantsBestResolution; }

    virtual bool isOpaque() const { return false; }
    /// Whether a click gives the view the keyboard.
    virtual bool acceptsFirstResponder() const { return false; }
    /// The view got the keyboard, or loses it. The answer has no effect.
    virtual bool becomeFirstResponder() { return true; }
    virtual bool resignFirstResponder() { return true; }

    /// Called once, when the context exists.
    virtual void prepareOpenGL() {}
    /// The size of the drawable, or what is known of its screen, has changed.
    virtual void reshape() {}
    /// The window system has made the drawable anew.
    virtual void renewGState() {}
    /// The drawable wants to be drawn.
    virtual void drawRect(const Rect& /*dirty*/) {}

    QSize sizeHint() const override;

  protected:
    /// Holds back the painting of the window's other widgets until the next flush, a tenth of a second at most, so that
    /// they change in one with the picture.
    void disableScreenUpdatesUntilFlush();

    bool event(QEvent* event) override;
    bool eventFilter(QObject* watched, QEvent* event) override;
    void paintEvent(QPaintEvent* event) override;
    void resizeEvent(QResizeEvent* event) override;
    void focusInEvent(QFocusEvent* event) override;
    void focusOutEvent(QFocusEvent* event) override;

  private:
    void applyTraits();
    void surfaceExposed();
    void surfaceCreated();
    void surfaceAboutToGo();
    bool prepare();
    void followScreen(QScreen* screen);
    void screenChanged();
    void reshapeIfChanged();

    PixelFormat m_pixelFormat;
    QPointer<QWindow> m_surface; // owned by m_container
    QWidget* m_container = nullptr;
    std::shared_ptr<GLContext> m_openGLContext;
    std::shared_ptr<WindowGLContext> m_windowContext; // the same, if the view made it
    bool m_prepared = false;
    bool m_refused = false; // there is no such context on this display
    bool m_wantsBestResolution = false;
    QSize m_drawable; // in pixels, as the window system has it; empty if it does not tell
    Rect m_shape;     // of the drawable, as last passed to reshape()
    QPointer<QScreen> m_screen;
};

} // namespace qivo
