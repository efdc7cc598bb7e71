#include "settings/general_page.h"

#include <QCheckBox>
#include <QLabel>

#include "shell/messages.h"
#include "support/settings_store.h"

namespace vqm {

namespace {

constexpr char16_t kRefreshSim[] = u"GeneralRefreshSim";
constexpr char16_t kRefreshOutlook[] = u"GeneralRefreshOutlook";
constexpr int kMargin = 10;
constexpr int kBoxSize = 16;
constexpr int kLabelGap = 25;
constexpr int kLabelHeight = 56;

// A missing value shows unchecked and stays missing: only a click writes.
bool ReadFlag(SettingsStore& store, const char16_t* name) {
    int32_t value = 0;
    return GetSettingInt(store, name, &value) && value != 0;
}

}  // namespace

GeneralPage::GeneralPage(QWidget* parent, ShellContext& context) : View(parent), context_(context) {
    title_ = new QLabel("Phonebook Settings:", this);
    refreshSim_ = new QCheckBox(this);
    refreshOutlook_ = new QCheckBox(this);
    SetControlId(refreshSim_, kGeneralRefreshSimId);
    SetControlId(refreshOutlook_, kGeneralRefreshOutlookId);
    simLabel_ = new QLabel("Refresh SIM/Card Phone contacts\nwhen startup", this);
    outlookLabel_ = new QLabel("Refresh Outlook contacts \nwhen startup", this);

    struct Pair {
        QCheckBox* box;
        const char16_t* name;
    };
    for (const Pair& pair :
         {Pair{refreshSim_, kRefreshSim}, Pair{refreshOutlook_, kRefreshOutlook}}) {
        pair.box->setChecked(ReadFlag(context_.settings, pair.name));
        // clicked, not toggled: reading the settings above must not write them back.
        QObject::connect(pair.box, &QCheckBox::clicked, this, [this, pair] {
            const int32_t value = pair.box->isChecked() ? 1 : 0;
            SetSettingInt(context_.settings, pair.name, &value);
        });
    }
    Relayout();
}

long GeneralPage::OnMessage(unsigned msg, long wParam, long) {
    if (msg == kWmCommand)
        if (QCheckBox* box = Box(static_cast<int>(wParam & 0xFFFF))) box->click();
    return 0;
}

QCheckBox* GeneralPage::Box(int id) const {
    return id == kGeneralRefreshSimId       ? refreshSim_
           : id == kGeneralRefreshOutlookId ? refreshOutlook_
                                            : nullptr;
}

void GeneralPage::resizeEvent(QResizeEvent*) {
    Relayout();
}

void GeneralPage::Relayout() {
    const QRect inner = rect().adjusted(kMargin, kMargin, -kMargin, -kMargin);
    title_->setGeometry(inner.left(), inner.top(), inner.width(), 16);
    const int labelLeft = inner.left() + kBoxSize + kLabelGap;
    const int labelWidth = std::max(0, inner.right() + 1 - labelLeft);
    refreshSim_->setGeometry(inner.left(), inner.top() + 60, kBoxSize, kBoxSize);
    // On a narrow window a line wraps within its label; the label grows by the one line that
    // can take.
    simLabel_->setGeometry(labelLeft, inner.top() + 60, labelWidth, kLabelHeight);
    refreshOutlook_->setGeometry(inner.left(), inner.top() + 120, kBoxSize, kBoxSize);
    outlookLabel_->setGeometry(labelLeft, inner.top() + 120, labelWidth, kLabelHeight);
    for (QLabel* label : {simLabel_, outlookLabel_}) {
        label->setAlignment(Qt::AlignLeft | Qt::AlignTop);
        label->setWordWrap(true);
    }
}

}  // namespace vqm
