// The Tones page on the offscreen platform: each choice is stored at once and the ring player
// takes it at its next ring, with no restart; a file of the user's must be a WAV file.
#include "settings/tones_page.h"

#include <gtest/gtest.h>

#include <QAbstractButton>
#include <QApplication>
#include <QCheckBox>
#include <QComboBox>
#include <QFileDialog>
#include <QSlider>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <memory>

#include "calls/ring_player.h"
#include "calls/tones.h"
#include "link/link.h"
#include "shell/dialogs.h"
#include "shell/messages.h"
#include "support/settings_store.h"
#include "support/text.h"
#include "tests/common/temp_folder.h"

namespace vqm {
namespace {

class TonesPageTest : public ::testing::Test {
  protected:
    TonesPageTest() {
        SetSettingString(settings_, u"InstallPath", Utf8ToUtf16(install_).c_str());
        // The file dialog picks what the test says; a box is recorded and answered.
        dialogs_.SetResponder([this](const DialogRequest& request) {
            if (!request.isDialog) {
                boxes_.push_back(request.text);
                return kIdOk;
            }
            auto* dialog = qobject_cast<QFileDialog*>(request.dialog);
            if (!dialog || pick_.empty()) return 0;
            dialog->selectFile(QString::fromStdString(pick_));
            return 1;
        });
        page_ = std::make_unique<TonesPage>(nullptr, context_);
    }

    QComboBox* Box(int id) { return qobject_cast<QComboBox*>(FindControl(page_.get(), id)); }
    // What a person's choice of a combo entry does.
    void Choose(int id, const QString& text) {
        QComboBox* box = Box(id);
        ASSERT_NE(box, nullptr);
        const int index = box->findText(text);
        ASSERT_GE(index, 0) << text.toStdString();
        box->setCurrentIndex(index);
        emit box->activated(index);
    }
    std::string Stored(const char16_t* name) {
        char16_t value[1024] = {};
        return GetSettingString(settings_, name, value, 1024) ? Utf16ToUtf8(value) : "<missing>";
    }
    // The file the next ring plays, and its volume, as the ring player reads them then.
    std::pair<std::string, float> NextRing() {
        ring_.Start();
        auto heard = std::make_pair(ring_.File().toStdString(), ring_.Volume());
        ring_.Stop();
        return heard;
    }
    std::string MakeFile(const char* name, const std::string& bytes) {
        const std::string path = temp_ / name;
        std::ofstream(path, std::ios::binary) << bytes;
        return path;
    }

    const testing::TempFolder temp_;
    const std::string install_ = temp_ / "install/";
    SettingsStore settings_{temp_ / "settings.db"};
    Link link_{settings_, DriverRoots{temp_ / "run", temp_ / "tty"}};
    Dialogs dialogs_;
    std::vector<std::u16string> boxes_;
    std::string pick_;
    ShellContext context_{settings_, link_, dialogs_, temp_ / "run"};
    RingPlayer ring_{settings_};
    std::unique_ptr<TonesPage> page_;
};

TEST_F(TonesPageTest, ShowsTheDefaultsAndWritesNothing) {
    EXPECT_EQ(Box(kRingToneId)->currentText(), "Ring1.wav");
    EXPECT_EQ(Box(kAlertToneId)->currentText(), "Alarm1.wav");
    EXPECT_EQ(qobject_cast<QSlider*>(FindControl(page_.get(), kRingLevelId))->value(), 3);
    EXPECT_FALSE(qobject_cast<QCheckBox*>(FindControl(page_.get(), kRingRaiseId))->isChecked());
    EXPECT_EQ(Stored(u"RingTonePath"), "<missing>");
    EXPECT_EQ(Stored(u"AlertTonePath"), "<missing>");
    int32_t level = -1;
    EXPECT_EQ(GetSettingInt(settings_, u"RingToneLevel", &level), 0);
    // The program's tones are there to be played.
    for (const char* name : {"Ring1.wav", "Ring2.wav", "Music.wav", "Alarm1.wav"})
        EXPECT_TRUE(std::filesystem::exists(install_ + name)) << name;
}

TEST_F(TonesPageTest, EachChoiceIsStoredAndTheNextRingUsesIt) {
    const std::string own = MakeFile("my tone.wav", ToneWavFile(Tone::Music));
    struct Step {
        std::function<void()> act;
        std::string file;  // what the next ring plays
        float volume;
    };
    auto* level = qobject_cast<QSlider*>(FindControl(page_.get(), kRingLevelId));
    auto* raise = qobject_cast<QCheckBox*>(FindControl(page_.get(), kRingRaiseId));
    const Step steps[] = {
        {[] {}, install_ + "Ring1.wav", 0.6f},
        {[&] { Choose(kRingToneId, "Ring2.wav"); }, install_ + "Ring2.wav", 0.6f},
        {[&] { level->setValue(5); }, install_ + "Ring2.wav", 1.0f},
        {[&] { level->setValue(0); }, install_ + "Ring2.wav", 0.0f},
        // Ascending: the ring starts at the first step and climbs to the level.
        {[&] { level->setValue(4), raise->setChecked(true); }, install_ + "Ring2.wav", 0.2f},
        {[&] { raise->setChecked(false); }, install_ + "Ring2.wav", 0.8f},
        {[&] { pick_ = own, Choose(kRingToneId, "Other..."); }, own, 0.8f},
        {[&] { Choose(kRingToneId, "Music.wav"); }, install_ + "Music.wav", 0.8f},
        // The user's file stays in the list once chosen.
        {[&] { Choose(kRingToneId, "my tone.wav"); }, own, 0.8f},
    };
    for (size_t i = 0; i < std::size(steps); ++i) {
        steps[i].act();
        const auto [file, volume] = NextRing();
        EXPECT_EQ(file, steps[i].file) << "step " << i;
        EXPECT_FLOAT_EQ(volume, steps[i].volume) << "step " << i;
    }
    int32_t stored = -1;
    EXPECT_TRUE(GetSettingInt(settings_, u"RingToneLevel", &stored));
    EXPECT_EQ(stored, 4);
    EXPECT_EQ(Stored(u"RingTonePath"), own);

    // The alert tone is the notification's sound from the next notification on.
    Choose(kAlertToneId, "Ring1.wav");
    EXPECT_EQ(Utf16ToUtf8(AlertTonePath(settings_)), install_ + "Ring1.wav");

    // A page made again shows what was chosen.
    page_ = std::make_unique<TonesPage>(nullptr, context_);
    EXPECT_EQ(Box(kRingToneId)->currentText(), "my tone.wav");
    EXPECT_EQ(Box(kAlertToneId)->currentText(), "Ring1.wav");
    EXPECT_EQ(qobject_cast<QSlider*>(FindControl(page_.get(), kRingLevelId))->value(), 4);
    EXPECT_TRUE(boxes_.empty());
}

TEST_F(TonesPageTest, AFileThatIsNotAWavOrNoFileKeepsTheChoiceBefore) {
    Choose(kRingToneId, "Music.wav");
    struct Case {
        std::string pick;
        size_t boxes;
    };
    const Case cases[] = {
        {MakeFile("song.mp3", "ID3\x03 not a wave at all"), 1},
        {MakeFile("short.wav", "RIFF"), 2},
        {"", 2},  // the dialog cancelled
    };
    for (const Case& c : cases) {
        pick_ = c.pick;
        Choose(kRingToneId, "Other...");
        EXPECT_EQ(Box(kRingToneId)->currentText(), "Music.wav") << c.pick;
        EXPECT_EQ(Stored(u"RingTonePath"), install_ + "Music.wav") << c.pick;
        EXPECT_EQ(boxes_.size(), c.boxes) << c.pick;
    }
    EXPECT_EQ(boxes_.front(), u"The file is not a WAV file.");
}

TEST_F(TonesPageTest, PlayPlaysTheChosenToneAtItsVolume) {
    Choose(kRingToneId, "Ring2.wav");
    qobject_cast<QSlider*>(FindControl(page_.get(), kRingLevelId))->setValue(5);
    qobject_cast<QAbstractButton*>(FindControl(page_.get(), kRingPlayId))->click();
    EXPECT_EQ(page_->PlayedFile().toStdString(), install_ + "Ring2.wav");
    EXPECT_FLOAT_EQ(page_->PlayedVolume(), 1.0f);
    qobject_cast<QAbstractButton*>(FindControl(page_.get(), kAlertPlayId))->click();
    EXPECT_EQ(page_->PlayedFile().toStdString(), install_ + "Alarm1.wav");
    EXPECT_FLOAT_EQ(page_->PlayedVolume(), 0.6f);
    if (const char* shots = std::getenv("VQM_SCREENSHOTS")) {
        std::filesystem::create_directories(shots);
        page_->resize(240, 268);
        page_->show();
        QApplication::processEvents();
        EXPECT_TRUE(
            page_->grab().save(QString::fromStdString(std::string(shots) + "/tones_page.png")));
    }
}

}  // namespace
}  // namespace vqm
