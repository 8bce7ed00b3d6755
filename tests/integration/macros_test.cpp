// kaExpandVASTMacros through the shared library, looked up as a player looks it up; the cases
// are in tests/data/macro_cases.txt.
#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "../unit/layout_fields.h"
#include "api_support.h"
#include "case_file.h"
#include "ka/vmap_parser_ext.h"

namespace {

using Strings = std::vector<std::string>;

KaExpandVASTMacrosFn Expand() {
    return reinterpret_cast<KaExpandVASTMacrosFn>(katest::LibrarySymbol("kaExpandVASTMacros"));
}

// Sets the field named in "name=value" from the layout list: 4 bytes an int32_t, 8 bytes an
// int64_t when the name ends in "Ms", else a text kept in texts.
void SetField(KaMacroValues* v, const std::string& assignment, std::vector<std::string>* texts) {
    const std::string name = assignment.substr(0, assignment.find('=')),
                      value = assignment.substr(name.size() + 1);
#define KA_FIELD_ROW(T, f, off, size) {#T, #f, off, size},
    const struct {
        const char *record, *field;
        size_t offset, size;
    } fields[] = {KA_LAYOUT_FIELDS(KA_FIELD_ROW)};
    char* at = reinterpret_cast<char*>(v);
    for (const auto& f : fields) {
        if (std::string(f.record) != "KaMacroValues" || name != f.field) continue;
        if (f.size == 4) {
            const int32_t n = std::stoi(value);
            memcpy(at + f.offset, &n, 4);
        } else if (name.size() > 2 && name.compare(name.size() - 2, 2, "Ms") == 0) {
            const int64_t n = std::stoll(value);
            memcpy(at + f.offset, &n, 8);
        } else {
            texts->push_back(value);
            const char* text = texts->back().c_str();
            memcpy(at + f.offset, &text, 8);
        }
        return;
    }
    FAIL() << "no field " << name;
}

// got matches expected, where "\d" in expected stands for one digit.
bool Matches(const std::string& got, const std::string& expected) {
    size_t g = 0;
    for (size_t e = 0; e < expected.size(); ++e, ++g) {
        if (g >= got.size()) return false;
        const bool digit = expected.compare(e, 2, "\\d") == 0;
        if (digit ? !isdigit(static_cast<unsigned char>(got[g])) : got[g] != expected[e])
            return false;
        e += digit ? 1 : 0;
    }
    return g == got.size();
}

TEST(Macros, Cases) {
    const auto rows = katest::ReadCases(KA_TEST_DATA_DIR "macro_cases.txt");
    for (const Strings& row : rows) {
        SCOPED_TRACE(testing::PrintToString(row));
        KaMacroValues values = KA_MACRO_VALUES_INIT;
        std::vector<std::string> texts;
        texts.reserve(row.size());
        bool none = false;
        for (size_t i = 2; i < row.size(); ++i) {
            if (row[i] == "values=null") none = true;
            if (row[i] != "values=null") SetField(&values, row[i], &texts);
        }
        const KaMacroValues* given = none ? nullptr : &values;
        std::string want = row[1];
        for (size_t d = want.find("\\d"); d != std::string::npos; d = want.find("\\d", d + 1))
            want.erase(d, 1);
        const uint32_t length = static_cast<uint32_t>(want.size());
        std::vector<char> out(length + 9, 'G');
        uint32_t got = 7;
        // Room to spare, exactly enough, and a byte short.
        EXPECT_EQ(Expand()(row[0].c_str(), given, out.data(), length + 9, &got), KA_OK);
        EXPECT_TRUE(Matches(out.data(), row[1])) << out.data();
        EXPECT_EQ(got, length);
        out.assign(length + 9, 'G');
        EXPECT_EQ(Expand()(row[0].c_str(), given, out.data(), length + 1, nullptr), KA_OK);
        EXPECT_TRUE(Matches(out.data(), row[1])) << out.data();
        EXPECT_EQ(out[length + 1], 'G');
        out.assign(length + 9, 'G');
        EXPECT_EQ(Expand()(row[0].c_str(), given, out.data(), length, &got),
                  KA_ERR_BUFFER_TOO_SMALL);
        EXPECT_EQ(got, length + 1);
        EXPECT_TRUE(length == 0 || out[0] == '\0');
        EXPECT_EQ(std::string(out.data() + length, 9), std::string(9, 'G'));
    }
    EXPECT_GE(rows.size(), 40u);
}

// Fresh digits each call; null arguments; the same function through the second table.
TEST(Macros, CacheBustingNullsAndTable) {
    char a[16] = {}, b[16] = {};
    ASSERT_EQ(Expand()("[CACHEBUSTING]", nullptr, a, sizeof(a), nullptr), KA_OK);
    ASSERT_EQ(Expand()("[CACHEBUSTING]", nullptr, b, sizeof(b), nullptr), KA_OK);
    EXPECT_EQ(strlen(a), 8u);
    EXPECT_STRNE(a, b);
    uint32_t got = 7;
    EXPECT_EQ(Expand()(nullptr, nullptr, a, sizeof(a), &got), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(Expand()("x", nullptr, nullptr, 16, &got), KA_ERR_NULL_ARGUMENT);
    EXPECT_EQ(Expand()("x", nullptr, a, 0, &got), KA_ERR_BUFFER_TOO_SMALL);
    EXPECT_EQ(got, 2u);

    EXPECT_EQ(katest::ExtApi().ExpandMacros, Expand());
    KaMacroValues values = KA_MACRO_VALUES_INIT;
    values.errorCode = 405;
    ASSERT_EQ(katest::ExtApi().ExpandMacros("e=[ERRORCODE]", &values, a, sizeof(a), &got), KA_OK);
    EXPECT_STREQ(a, "e=405");
}

}  // namespace
