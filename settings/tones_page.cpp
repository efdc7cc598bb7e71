#include "settings/tones_page.h"

#include <QAudioDevice>
#include <QCheckBox>
#include <QComboBox>
#include <QFile>
#include <QFileDialog>
#include <QFileInfo>
#include <QLabel>
#include <QMediaDevices>
#include <QPushButton>
#include <QSignalBlocker>
#include <QSlider>
#include <QSoundEffect>
#include <QUrl>
#include <algorithm>

#include "calls/tones.h"
#include "shell/dialogs.h"
#include "shell/messages.h"
#include "support/settings_store.h"

namespace vqm {

namespace {

constexpr int kMargin = 10, kRowHeight = 20, kPlayWidth = 44;
constexpr int kMaxToneLevel = 5, kDefaultToneLevel = 3;
// Each combo ends with this entry, which opens the file dialog.
const char* const kOtherFile = "Other...";

// A RIFF file of the WAVE form: what the player can take.
bool IsWavFile(const QString& path) {
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly)) return false;
    const QByteArray head = file.read(12);
    return head.size() == 12 && head.startsWith("RIFF") && head.mid(8, 4) == "WAVE";
}

int ReadInt(SettingsStore& settings, const char16_t* name, int fallback) {
    int32_t value = fallback;
    GetSettingInt(settings, name, &value);
    return value;
}

}  // namespace

TonesPage::TonesPage(QWidget* parent, ShellContext& context) : View(parent), context_(context) {
    setObjectName("SETTINGS_TONES_PAGE");
    // Play must find the program's own tones even before the DialPad first wrote them.
    EnsureToneFiles(context_.settings);
    const int width = (parent ? parent->width() : 240) - 2 * kMargin;
    const QStringList rings = {"Ring1.wav", "Ring2.wav", "Music.wav"};

    auto* ringTitle = new QLabel("Ring Tone:", this);
    ringTitle->setGeometry(kMargin, kMargin, width, 16);
    AddToneChoice(kRingToneId, kMargin + 20, width, u"RingTonePath", rings);

    auto* levelLabel = new QLabel("Volume:", this);
    levelLabel->setGeometry(kMargin, kMargin + 50, 60, kRowHeight);
    auto* level = new QSlider(Qt::Horizontal, this);
    SetControlId(level, kRingLevelId);
    level->setRange(0, kMaxToneLevel);
    level->setPageStep(1);
    level->setTickPosition(QSlider::TicksBelow);
    level->setGeometry(kMargin + 60, kMargin + 50, width - 60, kRowHeight + 4);
    level->setValue(std::clamp(ReadInt(context_.settings, u"RingToneLevel", kDefaultToneLevel), 0,
                               kMaxToneLevel));
    QObject::connect(level, &QSlider::valueChanged, this, [this](int value) {
        const int32_t stored = value;
        SetSettingInt(context_.settings, u"RingToneLevel", &stored);
    });

    auto* raise = new QCheckBox("Ascending volume", this);
    SetControlId(raise, kRingRaiseId);
    raise->setGeometry(kMargin, kMargin + 80, width, kRowHeight);
    raise->setChecked(ReadInt(context_.settings, u"RingToneRaise", 0) != 0);
    QObject::connect(raise, &QCheckBox::toggled, this, [this](bool on) {
        const int32_t stored = on ? 1 : 0;
        SetSettingInt(context_.settings, u"RingToneRaise", &stored);
    });

    auto* alertTitle = new QLabel("Alert Tone:", this);
    alertTitle->setGeometry(kMargin, kMargin + 115, width, 16);
    AddToneChoice(kAlertToneId, kMargin + 135, width, u"AlertTonePath",
                  QStringList{"Alarm1.wav"} + rings);
}

TonesPage::~TonesPage() {
    if (effect_) effect_->stop();
}

QString TonesPage::InstallFolder() {
    char16_t folder[1024];
    if (!GetInstallPath(context_.settings, folder, 1024))
        return QString::fromStdString(DefaultInstallPath());
    return QString::fromStdU16String(folder);
}

// A combo of the program's tones (by file name, the path in the install folder as its data),
// the user's file when the setting names one, and "Other...". Showing the page writes nothing.
QComboBox* TonesPage::AddToneChoice(int id, int y, int width, const char16_t* setting,
                                    const QStringList& names) {
    auto* box = new QComboBox(this);
    SetControlId(box, id);
    box->setGeometry(kMargin, y, width - kPlayWidth - 4, kRowHeight + 2);
    const QString folder = InstallFolder();
    for (const QString& name : names)
        box->addItem(name, folder + name);
    const std::u16string resolved = setting == std::u16string(u"RingTonePath")
                                        ? RingTonePath(context_.settings)
                                        : AlertTonePath(context_.settings);
    const QString current = QString::fromStdU16String(resolved);
    int index = box->findData(current);
    if (index < 0) {
        box->addItem(QFileInfo(current).fileName(), current);
        index = box->count() - 1;
        box->setItemData(index, current, Qt::ToolTipRole);
    }
    box->addItem(kOtherFile);
    box->setCurrentIndex(index);
    box->setProperty("kept", index);
    QObject::connect(box, &QComboBox::activated, this,
                     [this, box, setting](int) { Chosen(box, setting); });

    auto* play = new QPushButton("Play", this);
    SetControlId(play, id + 1);
    play->setGeometry(kMargin + width - kPlayWidth, y, kPlayWidth, kRowHeight + 2);
    QObject::connect(play, &QPushButton::clicked, this,
                     [this, id] { OnMessage(kWmCommand, id + 1, 0); });
    return box;
}

void TonesPage::Chosen(QComboBox* box, const char16_t* setting) {
    const int kept = box->property("kept").toInt();
    QString path = box->currentData().toString();
    if (box->currentText() == kOtherFile) {
        QFileDialog dialog(this, "Choose a WAV file",
                           QFileInfo(box->itemData(kept).toString()).path(), "WAV files (*.wav)");
        dialog.setObjectName(kToneFileDialogName);
        dialog.setOption(QFileDialog::DontUseNativeDialog);
        dialog.setFileMode(QFileDialog::ExistingFile);
        path.clear();
        if (context_.dialogs.Run(&dialog) == QDialog::Accepted && !dialog.selectedFiles().isEmpty())
            path = dialog.selectedFiles().first();
        if (!path.isEmpty() && !IsWavFile(path)) {
            context_.dialogs.MessageBox(this, u"The file is not a WAV file.", kBoxTitle,
                                        kMbOk | kMbIconExclamation | kMbTopmost);
            path.clear();
        }
        const QSignalBlocker quiet(box);
        if (path.isEmpty()) {
            box->setCurrentIndex(kept);
            return;
        }
        int index = box->findData(path);
        if (index < 0) {
            index = box->count() - 1;  // before "Other..."
            box->insertItem(index, QFileInfo(path).fileName(), path);
            box->setItemData(index, path, Qt::ToolTipRole);
        }
        box->setCurrentIndex(index);
    }
    box->setProperty("kept", box->currentIndex());
    SetSettingString(context_.settings, setting, path.toStdU16String().c_str());
}

long TonesPage::OnMessage(unsigned msg, long wParam, long) {
    if (msg != kWmCommand) return 0;
    const int id = static_cast<int>(wParam & 0xFFFF);
    if (id == kRingPlayId) {
        const auto* level = qobject_cast<QSlider*>(FindControl(this, kRingLevelId));
        Play(qobject_cast<QComboBox*>(FindControl(this, kRingToneId)),
             RingVolume(level ? level->value() : kDefaultToneLevel, 0, 0));
    } else if (id == kAlertPlayId) {
        Play(qobject_cast<QComboBox*>(FindControl(this, kAlertToneId)),
             RingVolume(ReadInt(context_.settings, u"AlertToneLevel", kDefaultToneLevel), 0, 0));
    }
    return 0;
}

void TonesPage::Play(QComboBox* box, float volume) {
    if (!box) return;
    playedFile_ = box->itemData(box->property("kept").toInt()).toString();
    playedVolume_ = volume;
    if (QMediaDevices::defaultAudioOutput().isNull()) return;  // silent, as the ring is
    if (!effect_) effect_ = new QSoundEffect(this);
    effect_->stop();
    effect_->setSource(QUrl::fromLocalFile(playedFile_));
    effect_->setLoopCount(1);
    effect_->setVolume(volume);
    effect_->play();
}

}  // namespace vqm
