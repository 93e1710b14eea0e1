#include "app/Binding.h"

#include <QAbstractButton>

namespace qivo {

void bindSwitch(QAbstractButton* control, AppData* model, const SwitchProperty& property) {
    const auto follow = [control, model, property] { control->setChecked((model->*property.read)()); };
    follow();
    QObject::connect(model, property.changed, control, follow);
    QObject::connect(control, &QAbstractButton::toggled, control, [model, property](bool checked) {
        // Equal when the control has just followed the model, which is no reason to announce anything again.
        if ((model->*property.read)() != checked) {
            (model->*property.write)(checked);
        }
    });
}

} // namespace qivo
