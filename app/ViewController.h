#pragma once

#include "app/AppData.h"

#include <QObject>
#include <QVariant>

namespace qivo {

/// The main view's controller: what the main window shows, and the place that further windows are opened from.
///
/// Thread: main.
class ViewController : public QObject {
    Q_OBJECT

  public:
    explicit ViewController(QObject* parent = nullptr);

    AppData* theModel() const { return m_theModel; }

    void viewDidLoad();
    QVariant representedObject() const { return m_representedObject; }
    void setRepresentedObject(const QVariant& object);

    /// Performs the segue of that identifier: it is prepared, then announced to whoever presents what it leads to. An
    /// identifier that nobody presents leads nowhere, without a word.
    void performSegue(const QString& identifier, QObject* sender);

    /// Nothing needs to be prepared: what is opened reaches the model by itself.
    void prepareForSegue(const QString& identifier, QObject* sender);

  signals:
    void seguePerformed(const QString& identifier, QObject* sender);

  private:
    AppData* m_theModel;
    QVariant m_representedObject;
};

} // namespace qivo
