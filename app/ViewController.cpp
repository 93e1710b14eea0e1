#include "app/ViewController.h"

namespace qivo {

ViewController::ViewController(QObject* parent) : QObject(parent), m_theModel(AppData::inst()) {}

void ViewController::viewDidLoad() {}

void ViewController::setRepresentedObject(const QVariant& object) {
    m_representedObject = object;
}

void ViewController::performSegue(const QString& identifier, QObject* sender) {
    prepareForSegue(identifier, sender);
    emit seguePerformed(identifier, sender);
}

void ViewController::prepareForSegue(const QString& /*identifier*/, QObject* /*sender*/) {}

} // namespace qivo
