// The case files of tests/data: one row a line, fields separated by " | ", blank lines and lines
// starting with '#' skipped, "" standing for an empty field and \xHH for the byte HH.
#pragma once

#include <cctype>
#include <fstream>
#include <string>
#include <vector>

namespace katest {

inline std::vector<std::vector<std::string>> ReadCases(const std::string& path) {
    std::ifstream file(path);
    std::vector<std::vector<std::string>> rows;
    for (std::string line; std::getline(file, line);) {
        if (line.empty() || line[0] == '#') continue;
        rows.emplace_back();
        for (size_t at = 0, end = 0; end != std::string::npos; at = end + 3) {
            end = line.find(" | ", at);
            std::string f = line.substr(at, end - at);
            for (size_t x = f.find("\\x"); x != std::string::npos; x = f.find("\\x", x + 1)) {
                if (x + 3 < f.size() && isxdigit(f[x + 2]) && isxdigit(f[x + 3]))
                    f.replace(x, 4, 1,
                              static_cast<char>(std::stoi(f.substr(x + 2, 2), nullptr, 16)));
            }
            rows.back().push_back(f == "\"\"" ? "" : f);
        }
    }
    return rows;
}

}  // namespace katest
