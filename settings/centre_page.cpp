#include "settings/centre_page.h"

#include <QApplication>
#include <QCheckBox>
#include <QComboBox>
#include <QDialogButtonBox>
#include <QFormLayout>
#include <QHeaderView>
#include <QLabel>
#include <QLineEdit>
#include <QMetaObject>
#include <QPainter>
#include <QPushButton>
#include <QTreeWidget>

#include "shell/dialogs.h"
#include "shell/messages.h"
#include "shell/ui_log.h"
#include "support/settings_store.h"

namespace vqm {

namespace {

constexpr int kMargin = 4;
constexpr int kButtonHeight = 22;
constexpr int kColumnTextLength = 64;

// Image 0 is blank, image 1 a check mark: drawn here, at the list's icon size.
QIcon CheckImage(int image) {
    QPixmap pixmap(16, 16);
    pixmap.fill(Qt::transparent);
    if (image == 1) {
        QPainter painter(&pixmap);
        painter.setRenderHint(QPainter::Antialiasing);
        painter.setPen(QPen(QColor(0, 128, 0), 2.5));
        painter.drawPolyline(QPolygonF({QPointF(3, 8), QPointF(7, 12), QPointF(13, 4)}));
    }
    return QIcon(pixmap);
}

QString Column(const std::u16string& text) {
    return QString::fromStdU16String(text.substr(0, kColumnTextLength));
}

}  // namespace

CentreDialog::CentreDialog(QWidget* parent, const CentreEntry& entry) : QDialog(parent) {
    setObjectName("135");
    setWindowTitle("VQM Dialer");
    auto* form = new QFormLayout(this);
    name = new QLineEdit(QString::fromStdU16String(entry.name), this);
    number = new QLineEdit(QString::fromStdU16String(entry.number), this);
    name->setMaxLength(kColumnTextLength - 1);
    number->setMaxLength(kColumnTextLength - 1);
    validity = new QComboBox(this);
    for (const char16_t* text : kValidityChoices)
        validity->addItem(QString::fromStdU16String(text));
    sendAs = new QComboBox(this);
    for (const char16_t* text : kSendAsChoices)
        sendAs->addItem(QString::fromStdU16String(text));
    // A stored text that is not one of the choices shows the default.
    const int v = validity->findText(QString::fromStdU16String(entry.validity));
    validity->setCurrentIndex(
        v >= 0 ? v : validity->findText(QString::fromStdU16String(kDefaultValidity)));
    const int s = sendAs->findText(QString::fromStdU16String(entry.sendAs));
    sendAs->setCurrentIndex(s >= 0 ? s : 0);
    form->addRow("Name:", name);
    form->addRow("Center Number:", number);
    form->addRow("Validity:", validity);
    form->addRow("Sent As:", sendAs);
    auto* buttons = new QDialogButtonBox(QDialogButtonBox::Ok | QDialogButtonBox::Cancel, this);
    form->addRow(buttons);
    QObject::connect(buttons, &QDialogButtonBox::accepted, this, &QDialog::accept);
    QObject::connect(buttons, &QDialogButtonBox::rejected, this, &QDialog::reject);
}

CentreEntry CentreDialog::Entry() const {
    CentreEntry entry;
    entry.name = name->text().toStdU16String();
    entry.number = number->text().trimmed().toStdU16String();
    entry.validity = validity->currentText().toStdU16String();
    entry.sendAs = sendAs->currentText().toStdU16String();
    return entry;
}

CentrePage::CentrePage(QWidget* parent, ShellContext& context) : View(parent), context_(context) {
    label_ = new QLabel("SMS Center:", this);
    list_ = new QTreeWidget(this);
    list_->setObjectName("SysListView32");
    SetControlId(list_, kCentreListId);
    list_->setColumnCount(4);
    list_->setHeaderLabels({"Name", "Center Number", "Validity", "Sent As"});
    list_->setRootIsDecorated(false);
    list_->setUniformRowHeights(true);
    list_->setSelectionMode(QAbstractItemView::SingleSelection);
    list_->header()->setStretchLastSection(false);
    newButton_ = new QPushButton("New...", this);
    editButton_ = new QPushButton("Edit...", this);
    deleteButton_ = new QPushButton("Delete", this);
    selectButton_ = new QPushButton("Select", this);
    useSim_ = new QCheckBox("Use SIM Default", this);
    SetControlId(newButton_, kCentreNewId);
    SetControlId(editButton_, kCentreEditId);
    SetControlId(deleteButton_, kCentreDeleteId);
    SetControlId(selectButton_, kCentreSelectId);
    SetControlId(useSim_, kCentreUseSimId);
    QObject::connect(newButton_, &QPushButton::clicked, this, [this] { NewCentre(); });
    QObject::connect(editButton_, &QPushButton::clicked, this, [this] { EditCentre(); });
    QObject::connect(deleteButton_, &QPushButton::clicked, this, [this] { DeleteCentre(); });
    QObject::connect(selectButton_, &QPushButton::clicked, this, [this] { Select(SelectedRow()); });
    QObject::connect(useSim_, &QCheckBox::clicked, this, [this](bool on) { UseSimDefault(on); });
    Relayout();
    Load(context_.mainWindow && context_.mainWindow->App().cardState == 2);
}

long CentrePage::OnMessage(unsigned msg, long wParam, long) {
    // The card has just connected: it learns the chosen centre again.
    if (msg == kMsgCardStateChanged && wParam == 2) Load(true);
    if (msg != kWmCommand) return 0;
    const int id = static_cast<int>(wParam & 0xFFFF);
    if (auto* button = qobject_cast<QAbstractButton*>(FindControl(this, id))) {
        if (button->isEnabled()) button->click();
    } else if (id >= kSettingsRowCommandFirst &&
               id < kSettingsRowCommandFirst + list_->topLevelItemCount()) {
        list_->setCurrentItem(list_->topLevelItem(id - kSettingsRowCommandFirst));
    }
    return 0;
}

void CentrePage::Load(bool pushToCard) {
    centres_ = LoadCentres(context_.settings);
    useSim_->setChecked(centres_.useSimDefault);
    Fill();
    EnableButtons();
    if (!pushToCard) return;
    if (centres_.simDefaultAbsent) {
        UseSimDefault(true);
    } else if (!centres_.useSimDefault && centres_.chosen >= 0) {
        const CentreEntry entry = centres_.entries[centres_.chosen];
        exchange_.Run(
            [this, entry] { return PushCentre(context_.link, entry); },
            [this, entry](int ok) { Log((ok ? u"chosen " : u"refused ") + entry.number); });
    }
}

void CentrePage::Fill() {
    list_->clear();
    for (size_t i = 0; i < centres_.entries.size(); ++i) {
        const CentreEntry& entry = centres_.entries[i];
        auto* item = new QTreeWidgetItem(list_, {Column(entry.name), Column(entry.number),
                                                 Column(entry.validity), Column(entry.sendAs)});
        (void)item;
    }
    MarkChosen(centres_.useSimDefault ? -1 : centres_.chosen);
}

void CentrePage::MarkChosen(int chosen) {
    for (int row = 0; row < list_->topLevelItemCount(); ++row) {
        const int image = row == chosen ? 1 : 0;
        list_->topLevelItem(row)->setIcon(0, CheckImage(image));
        list_->topLevelItem(row)->setData(0, kCentreImageRole, image);
    }
}

void CentrePage::EnableButtons() {
    const bool any = !centres_.entries.empty();
    editButton_->setEnabled(any);
    deleteButton_->setEnabled(any);
    selectButton_->setEnabled(any);
}

int CentrePage::SelectedRow() const {
    QTreeWidgetItem* item = list_->currentItem();
    return item ? list_->indexOfTopLevelItem(item) : -1;
}

bool CentrePage::AskEntry(CentreEntry* entry) {
    for (;;) {
        CentreDialog dialog(this, *entry);
        if (context_.dialogs.Run(&dialog) != kIdOk) return false;
        *entry = dialog.Entry();
        if (!entry->number.empty()) return true;
        context_.dialogs.MessageBox(this, u"Message center number must be existed.", kBoxTitle,
                                    kMbIconExclamation);
    }
}

void CentrePage::NewCentre() {
    if (exchange_.Busy()) return;
    CentreEntry entry;
    if (!AskEntry(&entry)) return;
    SaveCentre(context_.settings, static_cast<int>(centres_.entries.size()), entry);
    Load(false);
}

void CentrePage::EditCentre() {
    const int row = SelectedRow();
    if (exchange_.Busy() || row < 0 || row >= static_cast<int>(centres_.entries.size())) return;
    CentreEntry entry = centres_.entries[row];
    if (!AskEntry(&entry)) return;
    SaveCentre(context_.settings, row, entry);
    Load(false);
    // The card holds the chosen centre's old number until it is told the new one.
    if (row == centres_.chosen && !centres_.useSimDefault) Select(row);
}

void CentrePage::DeleteCentre() {
    const int row = SelectedRow();
    if (exchange_.Busy() || row < 0 || row >= static_cast<int>(centres_.entries.size())) return;
    // The card would go on using a centre that is no longer in the list, with nothing marked:
    // it goes back to the SIM's own, as a tap on "Use SIM Default" does.
    const bool wasInUse = !centres_.useSimDefault && row == centres_.chosen;
    vqm::DeleteCentre(context_.settings, row);
    Load(false);
    if (!wasInUse) return;
    useSim_->setChecked(true);
    UseSimDefault(true);
}

void CentrePage::Select(int row) {
    if (exchange_.Busy() || row < 0 || row >= static_cast<int>(centres_.entries.size())) return;
    const CentreEntry entry = centres_.entries[row];
    exchange_.Run([this, entry] { return PushCentre(context_.link, entry); },
                  [this, row, entry](int ok) {
                      // A card that refused keeps the marks and the choice as they were.
                      if (!ok || row >= static_cast<int>(centres_.entries.size())) {
                          Log(u"refused " + entry.number);
                          return;
                      }
                      Log(u"chosen " + entry.number);
                      centres_.chosen = row;
                      centres_.useSimDefault = false;
                      SaveChosenCentre(context_.settings, row);
                      SaveUseSimDefault(context_.settings, false);
                      useSim_->setChecked(false);
                      MarkChosen(row);
                  });
}

void CentrePage::Log(const std::u16string& text) {
    if (context_.uiLog) context_.uiLog->Line("settings-centre", text);
}

void CentrePage::UseSimDefault(bool use) {
    if (exchange_.Busy()) {
        useSim_->setChecked(centres_.useSimDefault);
        return;
    }
    if (!use) {
        // Back to the list: its chosen centre, when there is one, goes to the card.
        centres_.useSimDefault = false;
        SaveUseSimDefault(context_.settings, false);
        if (centres_.chosen >= 0) Select(centres_.chosen);
        return;
    }
    exchange_.Run([this] { return PushSimDefault(context_.link); },
                  [this](int ok) {
                      if (!ok) {
                          Log(u"refused sim default");
                          useSim_->setChecked(centres_.useSimDefault);
                          return;
                      }
                      Log(u"sim default");
                      centres_.useSimDefault = true;
                      centres_.simDefaultAbsent = false;
                      SaveUseSimDefault(context_.settings, true);
                      useSim_->setChecked(true);
                      MarkChosen(-1);
                  });
}

void CentrePage::resizeEvent(QResizeEvent*) {
    Relayout();
}

void CentrePage::Relayout() {
    const QRect inner = rect().adjusted(kMargin, kMargin, -kMargin, -kMargin);
    label_->setGeometry(inner.left(), inner.top(), inner.width(), 16);
    const int buttonsTop = inner.bottom() + 1 - 2 * kButtonHeight - 4 - 20;
    list_->setGeometry(inner.left(), inner.top() + 18, inner.width(),
                       std::max(0, buttonsTop - inner.top() - 22));
    const int half = (inner.width() - 4) / 2;
    newButton_->setGeometry(inner.left(), buttonsTop, half, kButtonHeight);
    editButton_->setGeometry(inner.left() + half + 4, buttonsTop, half, kButtonHeight);
    deleteButton_->setGeometry(inner.left(), buttonsTop + kButtonHeight + 2, half, kButtonHeight);
    selectButton_->setGeometry(inner.left() + half + 4, buttonsTop + kButtonHeight + 2, half,
                               kButtonHeight);
    useSim_->setGeometry(inner.left(), inner.bottom() + 1 - 18, inner.width(), 18);
}

}  // namespace vqm
