#include "support/files.h"

#include <unistd.h>

#include <filesystem>

namespace vqm {

bool FlushToDisk(FILE* file) {
    return std::fflush(file) == 0 && fsync(fileno(file)) == 0;
}

bool ReplaceFile(const std::string& path, const std::string& data) {
    const std::string tmpPath = path + ".tmp";
    FILE* tmp = std::fopen(tmpPath.c_str(), "wb");
    if (!tmp) return false;
    bool ok = std::fwrite(data.data(), 1, data.size(), tmp) == data.size() && FlushToDisk(tmp);
    ok = std::fclose(tmp) == 0 && ok;
    if (ok && std::rename(tmpPath.c_str(), path.c_str()) == 0) return true;
    std::remove(tmpPath.c_str());
    return false;
}

void DropPartialTail(const std::string& path, size_t recordSize) {
    std::error_code error;
    const auto size = std::filesystem::file_size(path, error);
    if (error || recordSize == 0) return;
    const auto whole = size - size % recordSize;
    if (whole != size) std::filesystem::resize_file(path, whole, error);
}

}  // namespace vqm
