#include "settings/network_page.h"

#include <QLabel>
#include <QLineEdit>
#include <QListWidget>
#include <QPushButton>
#include <QRadioButton>

#include "shell/dialogs.h"
#include "shell/messages.h"
#include "shell/ui_log.h"

namespace vqm {

namespace {

constexpr int kMargin = 4;
constexpr unsigned kMbIconError = 0x10;
constexpr int kResultError = 4;

}  // namespace

NetworkPage::NetworkPage(QWidget* parent, ShellContext& context) : View(parent), context_(context) {
    label_ = new QLabel("Current Operator:", this);
    operator_ = new QLineEdit(this);
    operator_->setReadOnly(true);
    operator_->setMaxLength(static_cast<int>(kOperatorNameSize) - 1);
    automatic_ = new QRadioButton("Automatic", this);
    manual_ = new QRadioButton("Manual", this);
    networks_ = new QListWidget(this);
    networks_->setFrameShape(QFrame::Box);
    networks_->setVerticalScrollBarPolicy(Qt::ScrollBarAlwaysOn);
    search_ = new QPushButton("Search Operators", this);
    register_ = new QPushButton("Register Operator", this);
    SetControlId(operator_, kNetworkOperatorId);
    SetControlId(automatic_, kNetworkAutomaticId);
    SetControlId(manual_, kNetworkManualId);
    SetControlId(networks_, kNetworkListId);
    SetControlId(search_, kNetworkSearchId);
    SetControlId(register_, kNetworkRegisterId);
    QObject::connect(automatic_, &QRadioButton::clicked, this, [this] { Automatic(); });
    QObject::connect(manual_, &QRadioButton::clicked, this, [this] { Manual(); });
    QObject::connect(search_, &QPushButton::clicked, this, [this] { Search(); });
    QObject::connect(register_, &QPushButton::clicked, this, [this] { Register(); });
    // Nothing to choose from until the card has said how it selects.
    networks_->setEnabled(false);
    search_->setEnabled(false);
    register_->setEnabled(false);
    Relayout();
    if (context_.mainWindow && context_.mainWindow->App().cardState == 2) Refresh();
}

long NetworkPage::OnMessage(unsigned msg, long wParam, long) {
    if (msg == kMsgCardStateChanged && wParam == 2) Refresh();
    if (msg != kWmCommand) return 0;
    const int id = static_cast<int>(wParam & 0xFFFF);
    QWidget* control = FindControl(this, id);
    if (auto* button = qobject_cast<QAbstractButton*>(control)) {
        if (button->isEnabled()) button->click();
    } else if (id >= kSettingsRowCommandFirst &&
               id < kSettingsRowCommandFirst + networks_->count()) {
        networks_->setCurrentRow(id - kSettingsRowCommandFirst);
    }
    return 0;
}

void NetworkPage::Log(const std::u16string& text) {
    if (context_.uiLog) context_.uiLog->Line("settings-network", text);
}

int NetworkPage::Box(const char16_t* text, unsigned icon) {
    return context_.dialogs.MessageBox(this, text, kBoxTitle, icon);
}

void NetworkPage::Refresh() {
    exchange_.Run(
        [this] {
            char16_t name[kOperatorNameSize] = u"";
            const int known = CurrentOperatorName(context_.link, name, kOperatorNameSize);
            foundOperator_ = known ? std::u16string(name) : std::u16string();
            foundMode_ = NetworkMode(context_.link);
            return known;
        },
        [this](int known) {
            // An operator the card did not name (or named in a way we cannot read) leaves the
            // field as it was.
            if (known) operator_->setText(QString::fromStdU16String(foundOperator_));
            ShowMode(foundMode_);
            Log(u"operator " + operator_->text().toStdU16String() +
                (foundMode_ == 0 ? u" automatic" : u" manual"));
        });
}

void NetworkPage::ShowMode(int mode) {
    mode_ = mode;
    // A card that does not say (-1) is treated as manual: the user can still search.
    const bool manual = mode != 0;
    manual_->setChecked(manual);
    automatic_->setChecked(!manual);
    networks_->setEnabled(manual);
    search_->setEnabled(manual);
    register_->setEnabled(false);
}

void NetworkPage::Automatic() {
    // The page shows manual selection exactly while its list is open.
    const bool wasManual = networks_->isEnabled();
    const bool ran = exchange_.Run(
        [this] {
            const int result = NetworkAutomatic(context_.link);
            if (result != -1 && result != kResultError) {
                char16_t name[kOperatorNameSize] = u"";
                foundOperator_ = CurrentOperatorName(context_.link, name, kOperatorNameSize)
                                     ? std::u16string(name)
                                     : std::u16string();
            }
            return result;
        },
        [this, wasManual](int result) {
            if (result == -1 || result == kResultError) {
                Box(u"Network registration failure.", kMbIconError);
                // Nothing changes: the buttons go back to what the page showed.
                manual_->setChecked(wasManual);
                automatic_->setChecked(!wasManual);
                return;
            }
            mode_ = 0;
            if (!foundOperator_.empty())
                operator_->setText(QString::fromStdU16String(foundOperator_));
            networks_->setEnabled(false);
            search_->setEnabled(false);
            register_->setEnabled(false);
        });
    if (!ran) {
        manual_->setChecked(wasManual);
        automatic_->setChecked(!wasManual);
    }
}

void NetworkPage::Manual() {
    networks_->setEnabled(true);
    search_->setEnabled(true);
    register_->setEnabled(searched_);
}

void NetworkPage::Search() {
    exchange_.Run(
        [this] {
            std::vector<OperatorName> names(kMaxNetworks);
            std::vector<int32_t> codes(kMaxNetworks, -1);
            int count = 0;
            const int result =
                NetworkSearchCodes(context_.link, names.data(), codes.data(), kMaxNetworks, &count);
            foundNames_.clear();
            foundCodes_.clear();
            for (int i = 0; result != -1 && i < count; ++i) {
                foundNames_.emplace_back(names[i]);
                foundCodes_.push_back(codes[i]);
            }
            return result;
        },
        [this](int result) {
            if (result == -1) {
                Box(u"Network Search Error", kMbIconError);
                return;
            }
            searched_ = true;
            networks_->clear();
            for (const std::u16string& name : foundNames_)
                networks_->addItem(QString::fromStdU16String(name));
            listedCodes_ = foundCodes_;
            register_->setEnabled(true);
            std::u16string listed = u"found";
            for (const std::u16string& name : foundNames_)
                listed += u" " + name + u";";
            Log(listed);
        });
}

void NetworkPage::Register() {
    const int row = networks_->currentRow();
    if (row < 0 || !networks_->currentItem()->isSelected()) {
        Box(u"Please select\na network first.", kMbIconError);
        return;
    }
    const std::u16string name = networks_->item(row)->text().toStdU16String();
    const int32_t code = row < static_cast<int>(listedCodes_.size()) ? listedCodes_[row] : -1;
    exchange_.Run(
        [this, name, code] { return NetworkRegisterListed(context_.link, name.c_str(), code); },
        [this, name](int result) {
            if (result == -1 || result == kResultError) {
                Box(u"Network Registration Failure.", kMbIconError);
            } else if (result == 0) {
                Box(u"Network Registration Success.", kMbIconInformation);
                operator_->setText(QString::fromStdU16String(name));
            }
        });
}

void NetworkPage::resizeEvent(QResizeEvent*) {
    Relayout();
}

void NetworkPage::Relayout() {
    const QRect inner = rect().adjusted(kMargin, kMargin, -kMargin, -kMargin);
    int y = inner.top();
    label_->setGeometry(inner.left(), y, inner.width(), 16);
    y += 18;
    operator_->setGeometry(inner.left(), y, inner.width(), 20);
    y += 24;
    automatic_->setGeometry(inner.left(), y, 80, 26);
    manual_->setGeometry(inner.left() + 84, y, 80, 26);
    y += 28;
    const int registerTop = inner.bottom() + 1 - 24;
    const int searchTop = registerTop - 25;
    networks_->setGeometry(inner.left(), y, inner.width(), std::max(0, searchTop - 4 - y));
    search_->setGeometry(inner.left(), searchTop, inner.width(), 22);
    register_->setGeometry(inner.left(), registerTop, inner.width(), 22);
}

}  // namespace vqm
