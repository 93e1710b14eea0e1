#include "discovery/QIVOFileMenu.h"

#include <QGuiApplication>

#include <algorithm>
#include <string_view>

namespace qivo {
namespace {

constexpr const char* kTitleProperty = "title";

std::string_view viewOf(const char* text) {
    return text != nullptr ? std::string_view(text) : std::string_view();
}

/// Whether a character is not seen but changes how others are. Some turn the direction of what follows round, so that
/// one name could pass for another. The two that join and part letters are words' and pictures' own.
bool isHiddenMark(char32_t character) {
    constexpr char32_t kNonJoiner = 0x200c;
    constexpr char32_t kJoiner = 0x200d;
    return QChar::category(character) == QChar::Other_Format && character != kNonJoiner && character != kJoiner;
}

bool isControl(char32_t character) {
    const QChar::Category category = QChar::category(character);
    return category == QChar::Other_Control || category == QChar::Separator_Line ||
           category == QChar::Separator_Paragraph;
}

/// A title as a menu shows it literally: "&" would mark a key, a tab would begin the column of shortcuts, a hidden mark
/// would deceive, and a title without end would make the menu wider than the screen.
QString menuText(QString title) {
    if (title.size() > QIVOFileMenu::kLongestTitle) {
        title.truncate(QIVOFileMenu::kLongestTitle);
        title.append(QChar(0x2026));
    }
    QList<uint> characters = title.toUcs4();
    for (uint& character : characters) {
        if (isControl(character)) {
            character = U' ';
        } else if (isHiddenMark(character)) {
            character = QChar::ReplacementCharacter;
        }
    }
    title = QString::fromUcs4(reinterpret_cast<const char32_t*>(characters.constData()), characters.size());
    return title.replace(QLatin1Char('&'), QLatin1String("&&"));
}

/// How many entries of the same title stand before an item; machines may come more than once.
int occurrenceOf(const QAction* item, const QMenu& menu) {
    int occurrence = 0;
    for (const QAction* other : menu.actions()) {
        if (other == item) {
            break;
        }
        occurrence += static_cast<int>(QIVOFileMenu::titleOf(other) == QIVOFileMenu::titleOf(item));
    }
    return occurrence;
}

QAction* itemAt(const QString& title, int occurrence, const QMenu& menu) {
    for (QAction* item : menu.actions()) {
        if (QIVOFileMenu::titleOf(item) == title && occurrence-- == 0) {
            return item;
        }
    }
    return nullptr;
}

} // namespace

QIVOFileMenu::QIVOFileMenu(QWidget* parent) : QMenu(parent) {
    initialize();
}

QIVOFileMenu::QIVOFileMenu(const QString& title, QWidget* parent) : QMenu(title, parent) {
    initialize();
}

QIVOFileMenu::~QIVOFileMenu() {
    if (_qivoFinder != nullptr) {
        QIVOlib_find_destroy(_qivoFinder);
    }
}

void QIVOFileMenu::initialize() {
    createQIVOFinder();
    connect(this, &QMenu::aboutToShow, this, &QIVOFileMenu::updateMenu);
    connect(&m_timer, &QTimer::timeout, this, &QIVOFileMenu::updatePeriodically);
    m_timer.start(kClosedIntervalMs);
}

bool QIVOFileMenu::createQIVOFinder() {
    if (_qivoFinder == nullptr) {
        const QIVOlib_find_create_t settings{true, nullptr, nullptr};
        _qivoFinder = QIVOlib_find_create_v2(&settings);
    }
    return _qivoFinder != nullptr;
}

void QIVOFileMenu::updateMenu() {
    if (createQIVOFinder() && QIVOlib_find_wait_for_sources(_qivoFinder, 0)) {
        rebuild();
    }
    emit updated();
}

/// Between press and release the entry under the pointer must stay what it is.
void QIVOFileMenu::updatePeriodically() {
    if (!isVisible() || (QGuiApplication::mouseButtons() == Qt::NoButton && entriesOnScreen() <= kMostLiveEntries)) {
        updateMenu();
    }
}

/// The entries of the largest menu that is open, from this one down.
qsizetype QIVOFileMenu::entriesOnScreen() const {
    qsizetype largest = 0;
    for (const QMenu* menu = this; menu != nullptr && menu->isVisible();) {
        largest = std::max(largest, menu->actions().size());
        menu = menu->activeAction() != nullptr ? menu->activeAction()->menu() : nullptr;
    }
    return largest;
}

void QIVOFileMenu::rebuild() {
    const Path path = highlightedPath();
    _numFoundSources = 0;
    _pFoundSources = QIVOlib_find_get_current_sources(_qivoFinder, &_numFoundSources);
    removeAllItems();
    SourceTree tree;
    for (std::uint32_t i = 0; i < _numFoundSources; ++i) {
        tree.addName(viewOf(_pFoundSources[i].p_name));
    }
    if (_numFoundSources > 0) {
        addNode(tree, SourceTree::kRoot, 0, this);
    } else {
        addPlaceholder();
    }
    highlight(path);
}

void QIVOFileMenu::removeAllItems() {
    const auto machines = findChildren<QMenu*>(QString(), Qt::FindDirectChildrenOnly);
    clear();
    for (QMenu* machine : machines) {
        // Later, because one of its own events may be what led here.
        removeAction(machine->menuAction());
        machine->hide();
        machine->deleteLater();
    }
}

std::int32_t QIVOFileMenu::addNode(const SourceTree& tree, SourceTree::Node node, std::int32_t withIndex,
                                   QMenu* toMenu) {
    if (node != SourceTree::kRoot) {
        const QString title = QString::fromStdString(tree.title(node));
        if (tree.isLeaf(node)) {
            addSourceItem(title, withIndex, toMenu);
            return withIndex + 1;
        }
        toMenu = addMachineItem(title, toMenu);
    }
    for (const SourceTree::Node child : tree.children(node)) {
        withIndex = addNode(tree, child, withIndex, toMenu);
    }
    return withIndex;
}

void QIVOFileMenu::addSourceItem(const QString& title, std::int32_t tag, QMenu* toMenu) {
    QAction* item = toMenu->addAction(menuText(title));
    item->setProperty(kTitleProperty, title);
    item->setData(tag);
    item->setEnabled(true);
    connect(item, &QAction::triggered, this, [this, item] { emit handleSelQIVOSource(item); });
}

QMenu* QIVOFileMenu::addMachineItem(const QString& title, QMenu* toMenu) {
    QMenu* machine = toMenu->addMenu(menuText(title));
    machine->menuAction()->setProperty(kTitleProperty, title);
    return machine;
}

void QIVOFileMenu::addPlaceholder() {
    const QString title = QString::fromLatin1(kPlaceholderTitle);
    QAction* item = addAction(title);
    item->setProperty(kTitleProperty, title);
    item->setData(kPlaceholderTag);
    item->setEnabled(false);
}

QString QIVOFileMenu::titleOf(const QAction* item) {
    const QVariant title = item->property(kTitleProperty);
    return title.isValid() ? title.toString() : item->text();
}

/// The highlighted entries, from this menu down through the open submenus. Empty while closed.
QIVOFileMenu::Path QIVOFileMenu::highlightedPath() const {
    Path path;
    for (const QMenu* menu = this; menu != nullptr && menu->isVisible();) {
        const QAction* item = menu->activeAction();
        if (item == nullptr) {
            break;
        }
        path.append({titleOf(item), occurrenceOf(item, *menu)});
        menu = item->menu();
    }
    return path;
}

/// Highlights these entries as far as they exist; the submenus on the way open.
void QIVOFileMenu::highlight(const Path& path) {
    QMenu* menu = this;
    for (const auto& [title, occurrence] : path) {
        QAction* item = itemAt(title, occurrence, *menu);
        if (item == nullptr) {
            return;
        }
        menu->setActiveAction(item);
        menu = item->menu();
        if (menu == nullptr) {
            return;
        }
    }
}

bool QIVOFileMenu::getQIVOFinderInfoAt(std::int32_t index, QString& named, QString& located) const {
    if (index < 0 || static_cast<std::uint32_t>(index) >= _numFoundSources) {
        return false;
    }
    const QIVOlib_source_t& source = _pFoundSources[index];
    named = QString::fromUtf8(source.p_name);
    located = QString::fromUtf8(source.p_url_address);
    return true;
}

void QIVOFileMenu::performActionForItemAtIndex(qsizetype index) {
    const QList<QAction*> items = actions();
    if (index >= 0 && index < items.size()) {
        items.at(index)->trigger();
    }
}

void QIVOFileMenu::applicationDidFinishLaunching() {
    createQIVOFinder();
}

void QIVOFileMenu::applicationWillTerminate() {
    m_timer.stop();
    if (_qivoFinder != nullptr) {
        // The list ends with its finder.
        _numFoundSources = 0;
        _pFoundSources = nullptr;
        QIVOlib_find_destroy(_qivoFinder);
        _qivoFinder = nullptr;
    }
}

void QIVOFileMenu::showEvent(QShowEvent* event) {
    QMenu::showEvent(event);
    if (m_timer.isActive()) {
        m_timer.start(kOpenIntervalMs);
    }
}

void QIVOFileMenu::hideEvent(QHideEvent* event) {
    QMenu::hideEvent(event);
    if (m_timer.isActive()) {
        m_timer.start(kClosedIntervalMs);
    }
}

} // namespace qivo
