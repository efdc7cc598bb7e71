// A fresh folder under /tmp for one test, removed with everything in it afterwards.
#pragma once

#include <stdlib.h>

#include <filesystem>
#include <string>

namespace vqm::testing {

class TempFolder {
  public:
    // parent: where the folder goes; a test that syncs thousands of small files picks a
    // memory-backed one.
    explicit TempFolder(const std::string& parent = "/tmp") {
        std::string pattern = parent + "/vqm-test-XXXXXX";
        const char* made = mkdtemp(pattern.data());
        path_ = made ? made : "";
    }
    ~TempFolder() {
        std::error_code ignored;
        if (!path_.empty()) std::filesystem::remove_all(path_, ignored);
    }
    TempFolder(const TempFolder&) = delete;
    TempFolder& operator=(const TempFolder&) = delete;

    const std::string& Path() const { return path_; }
    std::string operator/(const std::string& name) const { return path_ + "/" + name; }

  private:
    std::string path_;
};

}  // namespace vqm::testing
