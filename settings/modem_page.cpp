#include "settings/modem_page.h"

#include <QLabel>
#include <QListWidget>
#include <QRadioButton>

#include "settings/settings_view.h"
#include "shell/messages.h"
#include "support/settings_store.h"

namespace vqm {

namespace {

constexpr char16_t kMethodSetting[] = u"SettingsModemMethod";
constexpr char16_t kSpeedSetting[] = u"SettingsModemSpeed";
constexpr int kMargin = 10;
constexpr int kRightColumn = 100;       // the speed list stands this far from the right edge
constexpr int kSpeedFastestUpload = 1;  // 43.2 downloads, but uploads at 14.4
const char* const kMethodNames[kModemMethodCount] = {"Modem", "ISDN v.110", "ISDN v.120"};
const char* const kSpeedItems[kModemSpeedCount] = {"9.6 kbits/s", "14.4 kbits/s", "19.2 kbits/s",
                                                   "28.8 kbits/s", "43.2 kbits/s"};

// Missing, of the other type or outside its range: the first choice.
int ReadIndex(SettingsStore& store, const char16_t* name, int count, bool keepOutOfRange) {
    int32_t value = 0;
    if (!GetSettingInt(store, name, &value)) return 0;
    if (value >= 0 && value < count) return value;
    return keepOutOfRange ? value : 0;
}

}  // namespace

ModemPage::ModemPage(QWidget* parent, ShellContext& context)
    : ModemPage(parent, context, DefaultModemDriverFiles()) {}

ModemPage::ModemPage(QWidget* parent, ShellContext& context, ModemDriverFiles files)
    : View(parent), context_(context), files_(std::move(files)) {
    Build();
    // A stored method outside the three checks no button; the buttons then read as "Modem".
    const int method = ReadIndex(context_.settings, kMethodSetting, kModemMethodCount, true);
    const int speed = ReadIndex(context_.settings, kSpeedSetting, kModemSpeedCount, false);
    if (method >= 0 && method < kModemMethodCount) methods_[method]->setChecked(true);
    speeds_->setCurrentRow(speed);
    UpdateModemPage();
    QObject::connect(speeds_, &QListWidget::currentRowChanged, this,
                     [this](int) { UpdateModemPage(); });
    for (QRadioButton* button : methods_)
        QObject::connect(button, &QRadioButton::clicked, this, [this] {
            int method = 0, speed = 0;
            Store(&method, &speed);
        });
}

long ModemPage::OnMessage(unsigned msg, long wParam, long) {
    if (msg != kWmCommand) return 0;
    const int id = static_cast<int>(wParam & 0xFFFF);
    if (auto* button = qobject_cast<QAbstractButton*>(FindControl(this, id))) {
        button->click();
    } else if (id >= kSettingsRowCommandFirst && id < kSettingsRowCommandFirst + kModemSpeedCount) {
        speeds_->setCurrentRow(id - kSettingsRowCommandFirst);
    }
    return 0;
}

ModemPage::~ModemPage() {
    int method = 0, speed = 0;
    Store(&method, &speed);
}

void ModemPage::Build() {
    title_ = new QLabel("GSM Connection", this);
    methodsLabel_ = new QLabel("Methods:", this);
    speedLabel_ = new QLabel("Speed:", this);
    for (int m = 0; m < kModemMethodCount; ++m) {
        methods_[m] = new QRadioButton(kMethodNames[m], this);
        SetControlId(methods_[m], kModemMethodFirstId + m);
    }
    speeds_ = new QListWidget(this);
    SetControlId(speeds_, kModemSpeedListId);
    speeds_->setFrameShape(QFrame::Box);
    for (const char* item : kSpeedItems)
        speeds_->addItem(item);
    download_ = new QLabel("Download up to 28.8 kb/s", this);
    upload_ = new QLabel("Upload up to 28.8 kb/s", this);
    hscsd_ = new QLabel("HSCSD service is required.", this);
    SetControlId(download_, kModemDownloadId);
    SetControlId(upload_, kModemUploadId);
    SetControlId(hscsd_, kModemHscsdId);
    Relayout();
}

QRadioButton* ModemPage::Method(int method) const {
    return method >= 0 && method < kModemMethodCount ? methods_[method] : nullptr;
}

void ModemPage::Store(int* method, int* speed) {
    // The last checked button in this order wins; none checked is "Modem".
    *method = 0;
    for (int m = 1; m < kModemMethodCount; ++m)
        if (methods_[m]->isChecked()) *method = m;
    *speed = speeds_->currentRow() >= 0 ? speeds_->currentRow() : 0;
    const int32_t storedMethod = *method, storedSpeed = *speed;
    SetSettingInt(context_.settings, kMethodSetting, &storedMethod);
    SetSettingInt(context_.settings, kSpeedSetting, &storedSpeed);
    // A driver file that cannot be written leaves the settings as they are, silently.
    WriteModemCommand(context_.settings, files_, ModemCommand(*method, *speed));
}

void ModemPage::UpdateModemPage() {
    int method = 0, speed = 0;
    Store(&method, &speed);
    const QString down = QString::fromStdU16String(ModemSpeedText(speed));
    const QString up = QString::fromStdU16String(
        ModemSpeedText(speed == kModemSpeedCount - 1 ? kSpeedFastestUpload : speed));
    download_->setText(QString("Download up to %1 kbits/s").arg(down));
    upload_->setText(QString("Upload up to %1 kbits/s").arg(up));
    // Above 9.6 the network must offer HSCSD.
    hscsd_->setEnabled(speed != 0);
}

void ModemPage::resizeEvent(QResizeEvent*) {
    Relayout();
}

void ModemPage::Relayout() {
    const QRect inner = rect().adjusted(kMargin, kMargin, -kMargin, -kMargin);
    const int rightColumn = inner.right() + 1 - kRightColumn;
    title_->setGeometry(inner.left(), inner.top(), 110, 16);
    methodsLabel_->setGeometry(inner.left(), inner.top() + 32, 60, 16);
    speedLabel_->setGeometry(rightColumn, inner.top() + 32, 60, 16);
    for (int m = 0; m < kModemMethodCount; ++m)
        methods_[m]->setGeometry(inner.left(), inner.top() + 54 + 27 * m,
                                 std::max(0, rightColumn - inner.left()), 20);
    speeds_->setGeometry(rightColumn, inner.top() + 54, 100, 72);
    const int labelsTop = inner.bottom() + 1 - 60;
    download_->setGeometry(inner.left(), labelsTop, inner.width(), 16);
    upload_->setGeometry(inner.left(), labelsTop + 20, inner.width(), 16);
    hscsd_->setGeometry(inner.left(), labelsTop + 40, inner.width(), 16);
}

}  // namespace vqm
