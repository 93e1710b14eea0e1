#pragma once

#include "app/AppData.h"

class QAbstractButton;

namespace qivo {

/// A switch of the model: how it is read and written, and how its changes are announced.
struct SwitchProperty {
    bool (AppData::*read)() const;
    void (AppData::*write)(bool);
    void (AppData::*changed)();
};

/// Makes a checkable control and a switch of the model follow each other, beginning with the model's value. A change of
/// the model on another thread reaches the control through its event loop. The binding ends with the control; the
/// model must outlive it.
///
/// Thread: the control's.
void bindSwitch(QAbstractButton* control, AppData* model, const SwitchProperty& property);

} // namespace qivo
