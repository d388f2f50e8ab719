#include "platform/services.h"

#include <QDialog>

namespace tagora {

int DialogRunner::run(QDialog& dialog)
{
    return dialog.exec();
}

} // namespace tagora
