// The input format of the wrapper-chain fuzz target: up to nine documents separated by NUL
// bytes. The first is the one processed; the others become files "1" to "8" of a folder from
// which the source-IO module reads relative references, so wrappers lead to them.
// Header-only: the fuzz target and the regression test share it.
#pragma once

#include <fcntl.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <string>
#include <utility>
#include <vector>

namespace kachain {

constexpr int kFiles = 8;

inline std::string FilePath(const std::string& dir, int n) { return dir + "/" + std::to_string(n); }

// Removes the files a WriteFiles may have left, then the folder.
inline void RemoveFolder(const std::string& dir) {
    for (int n = 1; n <= kFiles; ++n) unlink(FilePath(dir, n).c_str());
    rmdir(dir.c_str());
}

// Writes the second to ninth documents of data into dir and removes the files of documents
// the input lacks, so nothing of an earlier input is left. Returns the first document; false
// in second when a file could not be written.
inline std::pair<std::pair<const uint8_t*, size_t>, bool> WriteFiles(const std::string& dir,
                                                                     const uint8_t* data,
                                                                     size_t size) {
    std::vector<std::pair<const uint8_t*, size_t>> parts;
    const uint8_t* start = data;
    for (size_t i = 0; i <= size && parts.size() <= static_cast<size_t>(kFiles); ++i) {
        if (i == size || data[i] == 0) {
            parts.emplace_back(start, static_cast<size_t>(data + i - start));
            start = data + i + 1;
        }
    }
    bool ok = true;
    for (int n = 1; n <= kFiles; ++n) {
        const std::string path = FilePath(dir, n);
        if (static_cast<size_t>(n) >= parts.size()) {
            unlink(path.c_str());
            continue;
        }
        const int fd = open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
        if (fd < 0) {
            ok = false;
            continue;
        }
        const uint8_t* p = parts[n].first;
        size_t left = parts[n].second;
        while (left > 0) {
            const ssize_t written = write(fd, p, left);
            if (written <= 0) {
                ok = false;
                break;
            }
            p += written;
            left -= static_cast<size_t>(written);
        }
        close(fd);
    }
    return {parts[0], ok};
}

}  // namespace kachain
