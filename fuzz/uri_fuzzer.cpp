// The URI functions of "ka/uri.h" on arbitrary strings. The first byte chooses which optional
// arguments are null; the rest splits at NUL bytes into up to five inputs. Every output is a
// heap buffer of exactly 2048 bytes, so a write past it is reported, and must come back
// terminated.
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <vector>

#include "ka/uri.h"

namespace {

constexpr size_t kUrlSize = 2048;

// A buffer the functions own for the call: heap-allocated to its exact size.
class Buffer {
public:
    explicit Buffer(const std::string& text) : mSize(text.size() + 1), mData(new char[mSize]) {
        memcpy(mData, text.c_str(), mSize);
    }
    Buffer() : mSize(kUrlSize), mData(new char[kUrlSize]) { memset(mData, 0, kUrlSize); }
    ~Buffer() { delete[] mData; }
    Buffer(const Buffer&) = delete;
    Buffer& operator=(const Buffer&) = delete;
    char* get() { return mData; }
    // Outputs must come back terminated within their 2048 bytes.
    void CheckTerminated(const char* what) const {
        if (memchr(mData, '\0', mSize) == nullptr) {
            fprintf(stderr, "uri fuzz: %s left an unterminated output\n", what);
            abort();
        }
    }

private:
    size_t mSize;
    char* mData;
};

char* Maybe(bool present, Buffer& buffer) { return present ? buffer.get() : nullptr; }

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    if (size == 0) return 0;
    const uint8_t nulls = data[0];
    std::vector<std::string> parts(1);
    for (size_t i = 1; i < size; ++i) {
        if (data[i] == '\0') {
            if (parts.size() == 5) break;
            parts.emplace_back();
        } else {
            parts.back().push_back(static_cast<char>(data[i]));
        }
    }
    parts.resize(5);

    {
        Buffer out, ref(parts[0]), base(parts[1]);
        CombineURL(Maybe(!(nulls & 1), out), ref.get(), Maybe(!(nulls & 2), base));
        out.CheckTerminated("CombineURL");
    }
    {
        Buffer out, ref(parts[0]), base(parts[1]);
        ResolveURI(out.get(), Maybe(!(nulls & 4), ref), Maybe(!(nulls & 2), base));
        out.CheckTerminated("ResolveURI");
    }
    {
        Buffer scheme, authority, path, query, fragment, uri(parts[0]);
        GetComponentOfURI(Maybe(!(nulls & 8), scheme), Maybe(!(nulls & 16), authority), path.get(),
                          Maybe(!(nulls & 32), query), fragment.get(), uri.get());
        scheme.CheckTerminated("GetComponentOfURI scheme");
        authority.CheckTerminated("GetComponentOfURI authority");
        path.CheckTerminated("GetComponentOfURI path");
        query.CheckTerminated("GetComponentOfURI query");
        fragment.CheckTerminated("GetComponentOfURI fragment");
    }
    {
        // The output is appended to: start it with the second input, cut to fit.
        Buffer out, in(parts[0]);
        strncpy(out.get(), parts[1].c_str(), (nulls & 64) ? kUrlSize - 1 : 0);
        RemoveDotSegments(out.get(), in.get());
        out.CheckTerminated("RemoveDotSegments");
    }
    {
        Buffer out, authority(parts[0]), path(parts[1]), ref(parts[2]);
        MergeURIPath(out.get(), Maybe(!(nulls & 8), authority), Maybe(!(nulls & 16), path),
                     ref.get());
        out.CheckTerminated("MergeURIPath");
    }
    {
        Buffer out, scheme(parts[0]), authority(parts[1]), path(parts[2]), query(parts[3]),
            fragment(parts[4]);
        GeneateURI(Maybe(!(nulls & 8), scheme), Maybe(!(nulls & 16), authority),
                   Maybe(!(nulls & 128), path), Maybe(!(nulls & 32), query),
                   Maybe(!(nulls & 1), fragment), out.get());
        out.CheckTerminated("GeneateURI");
    }
    return 0;
}
