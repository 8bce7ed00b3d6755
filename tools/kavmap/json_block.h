// The JSON writer of the record printer, shared by the printers of the records and of the
// extras: blocks indented two spaces per level, one key or item per line.
#pragma once

#include <cinttypes>
#include <cstdint>
#include <cstdio>

void Indent(FILE* out, int level);
// A JSON string literal of text (valid UTF-8 kept, anything else escaped); null for null.
void JsonString(FILE* out, const char* text);

class JsonBlock {
public:
    JsonBlock(FILE* out, int level, char open)
        : mOut(out), mLevel(level), mClose(open == '{' ? '}' : ']'), mEmpty(true) {
        fputc(open, out);
    }
    void Key(const char* key) {
        Next();
        fprintf(mOut, "\"%s\": ", key);
    }
    void Item() { Next(); }
    // Indentation of blocks nested in this one.
    int Inner() const { return mLevel + 1; }
    void End() {
        if (!mEmpty) {
            fputc('\n', mOut);
            Indent(mOut, mLevel);
        }
        fputc(mClose, mOut);
    }

private:
    void Next() {
        fputs(mEmpty ? "\n" : ",\n", mOut);
        Indent(mOut, mLevel + 1);
        mEmpty = false;
    }

    FILE* mOut;
    int mLevel;
    char mClose;
    bool mEmpty;
};

inline void JsonKeyString(FILE* out, JsonBlock& block, const char* key, const char* value) {
    block.Key(key);
    JsonString(out, value);
}

inline void JsonKeyU64(FILE* out, JsonBlock& block, const char* key, uint64_t value) {
    block.Key(key);
    fprintf(out, "%" PRIu64, value);
}

inline void JsonKeyI64(FILE* out, JsonBlock& block, const char* key, int64_t value) {
    block.Key(key);
    fprintf(out, "%" PRId64, value);
}
