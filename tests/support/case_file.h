// The case files of tests/data: one row a line, fields separated by " | ", blank lines and lines
// starting with '#' skipped, "" standing for an empty field, \xHH for the byte HH and C{N} for N
// copies of the character C.
#pragma once

#include <cctype>
#include <fstream>
#include <string>
#include <utility>
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
            for (size_t x = f.find('{', 1); x != std::string::npos; x = f.find('{', x + 1)) {
                const size_t close = f.find('}', x);
                if (close == std::string::npos || close == x + 1 ||
                    f.find_first_not_of("0123456789", x + 1) != close)
                    continue;
                f.replace(x - 1, close - x + 2, std::stoul(f.substr(x + 1)), f[x - 1]);
            }
            rows.back().push_back(f == "\"\"" ? "" : f);
        }
    }
    return rows;
}

// text with each name of names replaced by its value.
inline std::string Expand(std::string text,
                          const std::vector<std::pair<std::string, std::string>>& names) {
    for (const auto& [name, value] : names) {
        for (size_t at = text.find(name); at != std::string::npos;
             at = text.find(name, at + value.size()))
            text.replace(at, name.size(), value);
    }
    return text;
}

}  // namespace katest
