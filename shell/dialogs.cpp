#include "shell/dialogs.h"

#include <QDialog>
#include <QMessageBox>
#include <vector>

namespace vqm {

namespace {

constexpr unsigned kButtonMask = 0xF, kIconMask = 0xF0;
constexpr int kIdOk = 1, kIdCancel = 2, kIdAbort = 3, kIdRetry = 4, kIdIgnore = 5, kIdYes = 6,
              kIdNo = 7;

}  // namespace

int Dialogs::MessageBox(QWidget* parent, const std::u16string& text, const std::u16string& title,
                        unsigned style) {
    if (responder_) return responder_(DialogRequest{text, title, style, false, nullptr});
    QMessageBox box(parent);
    box.setText(QString::fromStdU16String(text));
    box.setWindowTitle(QString::fromStdU16String(title));
    switch (style & kIconMask) {
        case 0x10:
            box.setIcon(QMessageBox::Critical);
            break;
        case 0x20:
            box.setIcon(QMessageBox::Question);
            break;
        case 0x30:
            box.setIcon(QMessageBox::Warning);
            break;
        case 0x40:
            box.setIcon(QMessageBox::Information);
            break;
        default:
            break;
    }
    struct Button {
        QMessageBox::StandardButton button;
        int id;
    };
    std::vector<Button> buttons;
    switch (style & kButtonMask) {
        case 1:
            buttons = {{QMessageBox::Ok, kIdOk}, {QMessageBox::Cancel, kIdCancel}};
            break;
        case 2:
            buttons = {{QMessageBox::Abort, kIdAbort},
                       {QMessageBox::Retry, kIdRetry},
                       {QMessageBox::Ignore, kIdIgnore}};
            break;
        case 3:
            buttons = {{QMessageBox::Yes, kIdYes},
                       {QMessageBox::No, kIdNo},
                       {QMessageBox::Cancel, kIdCancel}};
            break;
        case 4:
            buttons = {{QMessageBox::Yes, kIdYes}, {QMessageBox::No, kIdNo}};
            break;
        case 5:
            buttons = {{QMessageBox::Retry, kIdRetry}, {QMessageBox::Cancel, kIdCancel}};
            break;
        default:
            buttons = {{QMessageBox::Ok, kIdOk}};
            break;
    }
    for (const Button& b : buttons)
        box.addButton(b.button);
    if (style & 0x40000) box.setWindowFlag(Qt::WindowStaysOnTopHint);
    const int pressed = box.exec();
    for (const Button& b : buttons)
        if (pressed == b.button) return b.id;
    return kIdCancel;  // closed without a button
}

int Dialogs::Run(QDialog* dialog) {
    if (responder_)
        return responder_(DialogRequest{dialog->objectName().toStdU16String(),
                                        dialog->windowTitle().toStdU16String(), 0, true, dialog});
    return dialog->exec();
}

}  // namespace vqm
