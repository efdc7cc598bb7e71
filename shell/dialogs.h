// Message boxes and dialogs. Every box and dialog goes through one Dialogs object, so that a
// test can install a responder that records each one and answers it instead of a person.
#pragma once

#include <functional>
#include <optional>
#include <string>

class QDialog;
class QWidget;

namespace vqm {

class UiLog;

struct DialogRequest {
    std::u16string text;  // a box's text, or a dialog's object name
    std::u16string title;
    unsigned style = 0;  // a box's style bits; 0 for dialogs
    bool isDialog = false;
    QDialog* dialog = nullptr;  // the dialog, built and ready, for a responder to look at
    // A box as it would be shown (text, icon and buttons set, not shown yet), for a responder
    // to look at as well: tests take pictures of the boxes the views really show.
    QDialog* box = nullptr;
};

class Dialogs {
  public:
    using Responder = std::function<int(const DialogRequest&)>;

    // A box with the text, title, buttons (OK, OK/Cancel, Yes/No ...) and icon of its style.
    // Returns the button's id (1 OK, 2 Cancel, 6 Yes, 7 No).
    int MessageBox(QWidget* parent, const std::u16string& text, const std::u16string& title,
                   unsigned style);
    // Runs a dialog modally and returns its result.
    int Run(QDialog* dialog);
    void SetResponder(Responder responder) { responder_ = std::move(responder); }
    // Scripted runs: every box and dialog is answered at once with this id (1 OK, 2 Cancel)
    // instead of waiting for a person; 0 asks the person.
    void SetAutoAnswer(int id) { autoAnswer_ = id; }
    // Scripted runs: before a dialog is answered, the file at path (when there) fills it in and
    // is removed. One line: the dialog's object name, then "ID=text" (an edit's text or a list's
    // entry) and "ID" (a button clicked), e.g. "ENTER_ACCESS_CODE_DIALOG 1171=0000".
    void SetFieldsFile(std::string path) { fieldsFile_ = std::move(path); }
    // Each box and dialog, with its texts and the answer, goes to the log as well.
    void SetLog(UiLog* log) { log_ = log; }

  private:
    std::optional<int> Answer(const DialogRequest& request);
    void Record(const DialogRequest& request, int answer);

    Responder responder_;
    void FillFromFile(QDialog* dialog);

    int autoAnswer_ = 0;
    std::string fieldsFile_;
    UiLog* log_ = nullptr;
};

}  // namespace vqm
