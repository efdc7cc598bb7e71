#include "shell/dialogs.h"

#include <QAbstractButton>
#include <QApplication>
#include <QComboBox>
#include <QDialog>
#include <QLabel>
#include <QLineEdit>
#include <QMessageBox>
#include <QThread>
#include <cstdio>
#include <fstream>
#include <optional>
#include <sstream>
#include <vector>

#include "shell/views.h"

#include "shell/ui_log.h"

namespace vqm {

namespace {

constexpr unsigned kButtonMask = 0xF, kIconMask = 0xF0;
constexpr int kIdOk = 1, kIdCancel = 2, kIdAbort = 3, kIdRetry = 4, kIdIgnore = 5, kIdYes = 6,
              kIdNo = 7;

}  // namespace

// The responder's or the scripted answer, when there is one; else nullopt and a person answers.
std::optional<int> Dialogs::Answer(const DialogRequest& request) {
    if (!responder_ && !autoAnswer_) return std::nullopt;
    const int answer = responder_ ? responder_(request) : autoAnswer_;
    Record(request, answer);
    return answer;
}

void Dialogs::Record(const DialogRequest& request, int answer) {
    if (!log_ || !log_->Enabled()) return;
    std::u16string line = request.title + u": ";
    if (request.dialog) {
        // A dialog is recorded by what it says: the texts of its labels, in order.
        bool first = true;
        for (const QLabel* label : request.dialog->findChildren<QLabel*>()) {
            if (label->text().isEmpty()) continue;
            line += (first ? u"" : u" | ") + label->text().toStdU16String();
            first = false;
        }
    } else {
        line += request.text;
    }
    const std::u16string answerText = answer == kIdOk       ? u"OK"
                                      : answer == kIdCancel ? u"Cancel"
                                      : answer == kIdYes    ? u"Yes"
                                      : answer == kIdNo     ? u"No"
                                                            : u"other";
    log_->Line(request.isDialog ? "dialog" : "box", line + u" -> " + answerText);
}

int Dialogs::MessageBox(QWidget* parent, const std::u16string& text, const std::u16string& title,
                        unsigned style) {
    DialogRequest request{text, title, style, false, nullptr};
    // A box is a widget: it is made for the responder only where widgets may be.
    const bool widgetsHere = qobject_cast<QApplication*>(QCoreApplication::instance()) &&
                             QThread::currentThread() == QCoreApplication::instance()->thread();
    if (!widgetsHere)
        if (const auto answer = Answer(request)) return *answer;
    QMessageBox box(parent);
    // Texts may carry names, numbers and messages from outside: never read as markup.
    box.setTextFormat(Qt::PlainText);
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
    request.box = &box;
    if (widgetsHere)
        if (const auto answer = Answer(request)) return *answer;
    box.exec();
    int answer = kIdCancel;  // closed without a button
    for (const Button& b : buttons)
        if (box.clickedButton() == box.button(b.button)) answer = b.id;
    Record(request, answer);
    return answer;
}

void Dialogs::FillFromFile(QDialog* dialog) {
    std::ifstream file(fieldsFile_);
    std::string line;
    if (!file || !std::getline(file, line)) return;
    std::istringstream words(line);
    std::string name, item;
    if (!(words >> name) || name != dialog->objectName().toStdString()) return;
    file.close();
    std::remove(fieldsFile_.c_str());  // one dialog's worth
    while (words >> item) {
        const size_t equals = item.find('=');
        QWidget* control = FindControl(dialog, std::atoi(item.substr(0, equals).c_str()));
        const QString text = QString::fromStdString(
            equals == std::string::npos ? std::string() : item.substr(equals + 1));
        if (auto* edit = qobject_cast<QLineEdit*>(control))
            edit->setText(text);
        else if (auto* list = qobject_cast<QComboBox*>(control))
            list->setCurrentIndex(list->findText(text));
        else if (auto* button = qobject_cast<QAbstractButton*>(control))
            button->click();
    }
}

int Dialogs::Run(QDialog* dialog) {
    if (autoAnswer_ && !responder_ && !fieldsFile_.empty()) FillFromFile(dialog);
    const DialogRequest request{dialog->objectName().toStdU16String(),
                                dialog->windowTitle().toStdU16String(), 0, true, dialog};
    if (const auto answer = Answer(request)) return *answer;
    const int answer = dialog->exec();
    Record(request, answer);
    return answer;
}

}  // namespace vqm
