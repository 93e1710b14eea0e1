#pragma once

#include "discovery/SourceTree.h"
#include "sdk/qivo.h"

#include <QList>
#include <QMenu>
#include <QString>
#include <QTimer>

#include <cstdint>
#include <utility>

namespace qivo {

/// The menu of the sources on the network, grouped by machine. It owns the finder and keeps the finder's latest list;
/// a source item's tag (the action's data) is the source's index in it, since items and list are replaced together.
///
/// The menu refreshes itself when it is about to show and on a timer, so that an open menu follows the network. A
/// refresh never waits, and rebuilds only after a change. An open menu keeps its highlighted entry through a rebuild
/// where the entry still exists.
///
/// Thread: main.
class QIVOFileMenu : public QMenu {
    Q_OBJECT

  public:
    /// The tag of the entry that stands in for an empty list.
    static constexpr int kPlaceholderTag = -1;
    static constexpr const char* kPlaceholderTitle = "No Sources Found Yet";

    /// While closed, the refresh only keeps the list ready and tries again for a finder that could not be made.
    static constexpr int kClosedIntervalMs = 1000;
    /// While open, changes are to appear while the user looks.
    static constexpr int kOpenIntervalMs = 250;
    /// While this menu or an open one below it has more entries than this, the sources are left as they are, because
    /// the toolkit measures an open menu anew for every entry that comes or goes.
    static constexpr int kMostLiveEntries = 250;
    /// Characters of a title that are shown; the rest is replaced by an ellipsis.
    static constexpr int kLongestTitle = 200;

    /// Discovery starts at once.
    explicit QIVOFileMenu(QWidget* parent = nullptr);
    explicit QIVOFileMenu(const QString& title, QWidget* parent = nullptr);
    ~QIVOFileMenu() override;

    /// Makes the finder if there is none yet. False if it cannot be made now.
    bool createQIVOFinder();

    /// The refresh. Its name keeps clear of `QWidget::update`, which asks for a repaint.
    void updateMenu();

    /// Appends a node's items to a menu and returns the next index; the node's leaves take theirs from `withIndex`.
    std::int32_t addNode(const SourceTree& tree, SourceTree::Node node, std::int32_t withIndex, QMenu* toMenu);

    /// Name and URL at an index of the list. False, with the arguments untouched, if the index is out of range.
    bool getQIVOFinderInfoAt(std::int32_t index, QString& named, QString& located) const;

    /// Does what choosing the menu's entry at that place does. Nothing if there is none.
    void performActionForItemAtIndex(qsizetype index);

    void applicationDidFinishLaunching();

    /// Ends the finder, and the refreshes with it. Indices are out of range from then on.
    void applicationWillTerminate();

    /// An item's title as the source or machine has it; `QAction::text` is made fit for a menu.
    static QString titleOf(const QAction* item);

  signals:
    /// A source item was chosen.
    void handleSelQIVOSource(QAction* sender);
    /// A refresh has ended, and items may need validation.
    void updated();

  protected:
    void showEvent(QShowEvent* event) override;
    void hideEvent(QHideEvent* event) override;

  private:
    /// From this menu down: an entry's title, and which one it is of the entries with that title.
    using Path = QList<std::pair<QString, int>>;

    void initialize();
    void updatePeriodically();
    qsizetype entriesOnScreen() const;
    void rebuild();
    void removeAllItems();
    Path highlightedPath() const;
    void highlight(const Path& path);
    void addSourceItem(const QString& title, std::int32_t tag, QMenu* toMenu);
    QMenu* addMachineItem(const QString& title, QMenu* toMenu);
    void addPlaceholder();

    QIVOlib_find_instance_t _qivoFinder = nullptr;
    const QIVOlib_source_t* _pFoundSources = nullptr; // the finder's
    std::uint32_t _numFoundSources = 0;
    QTimer m_timer;
};

} // namespace qivo
