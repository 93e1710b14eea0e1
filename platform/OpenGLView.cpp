#include "platform/OpenGLView.h"

#include "platform/DrawableSize.h"
#include "platform/WindowGLContext.h"

#include <QExposeEvent>
#include <QPainter>
#include <QPlatformSurfaceEvent>
#include <QScreen>
#include <QTimer>
#include <QWindow>
#include <cmath>

namespace qivo {
namespace {

constexpr QSize kSuggestedSize(640, 360);
constexpr int kLongestHoldMs = 100;

} // namespace

OpenGLView::OpenGLView(QWidget* parent, const PixelFormat& pixelFormat)
    : QWidget(parent), m_pixelFormat(pixelFormat), m_surface(new QWindow) {
    m_surface->setSurfaceType(QSurface::OpenGLSurface);
    m_surface->setFormat(pixelFormat.surfaceFormat());
    m_container = createWindowContainer(m_surface, this);
    m_surface->setFlag(Qt::WindowTransparentForInput);
    m_container->setFocusPolicy(Qt::NoFocus);
    m_container->setGeometry(rect());
    m_surface->installEventFilter(this);
    connect(m_surface, &QWindow::screenChanged, this, [this](QScreen* screen) {
        followScreen(screen);
        screenChanged();
    });
    followScreen(m_surface->screen());
}

OpenGLView::~OpenGLView() {
    if (m_surface) {
        m_surface->removeEventFilter(this);
        m_surface->disconnect(this);
    }
    // The context borrows the window, which goes with the container.
    m_openGLContext.reset();
    m_windowContext.reset();
}

PixelFormat OpenGLView::defaultPixelFormat() {
    return PixelFormat::initWithAttributes({0});
}

void OpenGLView::setOpenGLContext(std::shared_ptr<GLContext> context) {
    m_openGLContext = std::move(context);
    m_windowContext.reset();
}

Rect OpenGLView::convertRectToBacking(const Rect& rect) const {
    // With a scale that is no whole number, the drawable's pixels do not follow from the widget's size: 267 units
    // of 1.5 pixels may be a drawable of 400 or of 401. What the drawable really has is what the viewport must fit.
    const bool known = !m_drawable.isEmpty() && width() > 0 && height() > 0;
    const double scale = devicePixelRatioF();
    const double horizontal = known ? m_drawable.width() / static_cast<double>(width()) : scale;
    const double vertical = known ? m_drawable.height() / static_cast<double>(height()) : scale;
    return {{std::round(rect.origin.x * horizontal), std::round(rect.origin.y * vertical)},
            {std::round(rect.size.width * horizontal), std::round(rect.size.height * vertical)}};
}

Rect OpenGLView::bounds() const {
    return {{0, 0}, {static_cast<double>(width()), static_cast<double>(height())}};
}

QSize OpenGLView::sizeHint() const {
    return kSuggestedSize;
}

void OpenGLView::disableScreenUpdatesUntilFlush() {
    QPointer<QWidget> held = window();
    if (!m_openGLContext || !held->updatesEnabled()) {
        return;
    }
    held->setUpdatesEnabled(false);
    const auto resume = [held] {
        if (held) {
            held->setUpdatesEnabled(true);
        }
    };
    QPointer<OpenGLView> self = this;
    m_openGLContext->afterNextFlush([self, resume] { QMetaObject::invokeMethod(self, resume, Qt::QueuedConnection); });
    QTimer::singleShot(kLongestHoldMs, held, resume);
}

bool OpenGLView::event(QEvent* event) {
    if (event->type() == QEvent::Polish) {
        applyTraits();
    }
    return QWidget::event(event);
}

/// A click gives the view the keyboard, the Tab key does not: the view has nothing to do with keys.
void OpenGLView::applyTraits() {
    setFocusPolicy(acceptsFirstResponder() ? Qt::ClickFocus : Qt::NoFocus);
    setAttribute(Qt::WA_OpaquePaintEvent, isOpaque());
}

bool OpenGLView::eventFilter(QObject* watched, QEvent* event) {
    if (watched != m_surface) {
        return QWidget::eventFilter(watched, event);
    }
    if (event->type() == QEvent::Expose) {
        surfaceExposed();
    } else if (event->type() == QEvent::Resize) {
        reshapeIfChanged();
    } else if (event->type() == QEvent::PlatformSurface) {
        const auto* surfaceEvent = static_cast<QPlatformSurfaceEvent*>(event);
        if (surfaceEvent->surfaceEventType() == QPlatformSurfaceEvent::SurfaceCreated) {
            surfaceCreated();
        } else {
            surfaceAboutToGo();
        }
    }
    return false;
}

void OpenGLView::surfaceExposed() {
    const bool visible = m_surface->isExposed();
    if (visible && !m_prepared && !prepare()) {
        return;
    }
    if (m_windowContext) {
        m_windowContext->setVisible(visible);
    }
    if (visible) {
        reshapeIfChanged();
        drawRect(bounds());
    }
}

bool OpenGLView::prepare() {
    if (!m_openGLContext && !m_refused) {
        m_windowContext = WindowGLContext::create(*m_surface, m_pixelFormat);
        m_openGLContext = m_windowContext;
        m_refused = !m_openGLContext;
    }
    if (!m_openGLContext) {
        m_container->hide(); // so that the widget's black is what one sees
        return false;
    }
    m_prepared = true;
    m_drawable = drawableSize(*m_surface);
    if (m_windowContext) {
        m_windowContext->setRefreshRate(m_surface->screen()->refreshRate());
        m_windowContext->setVisible(true);
    }
    // With the lock held, so that a thread that is started meanwhile finds everything in place.
    m_openGLContext->lock();
    prepareOpenGL();
    m_shape = convertRectToBacking(bounds());
    reshape();
    m_openGLContext->unlock();
    return true;
}

void OpenGLView::surfaceCreated() {
    if (m_windowContext) {
        m_windowContext->setDrawable(true);
        renewGState();
        m_drawable = drawableSize(*m_surface);
        m_shape = convertRectToBacking(bounds());
        reshape();
    }
}

void OpenGLView::surfaceAboutToGo() {
    if (m_windowContext) {
        m_windowContext->setVisible(false);
        m_windowContext->setDrawable(false);
    }
}

void OpenGLView::followScreen(QScreen* screen) {
    if (m_screen) {
        m_screen->disconnect(this);
    }
    m_screen = screen;
    if (screen != nullptr) {
        connect(screen, &QScreen::refreshRateChanged, this, &OpenGLView::screenChanged);
        connect(screen, &QScreen::geometryChanged, this, &OpenGLView::screenChanged);
        connect(screen, &QScreen::logicalDotsPerInchChanged, this, &OpenGLView::screenChanged);
    }
}

void OpenGLView::screenChanged() {
    if (m_windowContext && m_screen) {
        m_windowContext->setRefreshRate(m_screen->refreshRate());
    }
    reshapeIfChanged();
}

void OpenGLView::reshapeIfChanged() {
    if (m_windowContext && m_surface) {
        m_drawable = drawableSize(*m_surface);
    }
    const Rect shape = convertRectToBacking(bounds());
    if (m_prepared && !(shape == m_shape)) {
        m_shape = shape;
        reshape();
    }
}

void OpenGLView::paintEvent(QPaintEvent* /*event*/) {
    QPainter(this).fillRect(rect(), Qt::black);
}

void OpenGLView::resizeEvent(QResizeEvent* event) {
    QWidget::resizeEvent(event);
    m_container->setGeometry(rect());
    reshapeIfChanged();
}

void OpenGLView::focusInEvent(QFocusEvent* event) {
    becomeFirstResponder();
    QWidget::focusInEvent(event);
}

void OpenGLView::focusOutEvent(QFocusEvent* event) {
    resignFirstResponder();
    QWidget::focusOutEvent(event);
}

} // namespace qivo
