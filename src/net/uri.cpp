// URL joining (CombineURL) and RFC 3986 style resolution (ResolveURI and its parts). URLs come
// from ad documents, so every write is bounded by the 2048-byte buffers the callers hold and
// every scan ends at the terminator.
#include "ka/uri.h"

#include <cstring>
#include <initializer_list>

#include "net/uri_whole.h"
#include "platform/limits.h"

namespace {

constexpr size_t kMaxLength = ka::kUrlSize - 1;

// Schemes that make a reference absolute for CombineURL, tested as substrings.
const char* const kAbsolutePrefixes[] = {
    "http://", "https://", "iprm://", "vrkp://", "vrkps://", "smdrm://", "tivocrypt://",
};

bool Present(const char* text) { return text != nullptr && text[0] != '\0'; }

// Appends n bytes of src to the terminated string in dst, cutting at kMaxLength characters;
// *cut (when given) is set when something was cut.
void AppendN(char* dst, const char* src, size_t n, bool* cut = nullptr) {
    size_t used = strnlen(dst, kMaxLength);
    if (n > kMaxLength - used) {
        n = kMaxLength - used;
        if (cut != nullptr) *cut = true;
    }
    memmove(dst + used, src, n);
    dst[used + n] = '\0';
}

void Append(char* dst, const char* src, bool* cut = nullptr) {
    if (src == nullptr) return;
    const size_t n = strnlen(src, kMaxLength + 1);
    if (n > kMaxLength && cut != nullptr) *cut = true;
    AppendN(dst, src, n > kMaxLength ? kMaxLength : n, cut);
}

// Writes n bytes of src as the whole, terminated content of dst.
void AssignN(char* dst, const char* src, size_t n) {
    if (dst == nullptr) return;
    dst[0] = '\0';
    AppendN(dst, src, n);
}

// Length of text up to and including its last '\\' or, failing that, its last '/'; 0 if none.
size_t DirectoryLength(const char* text, size_t length) {
    for (char separator : {'\\', '/'}) {
        for (size_t i = length; i > 0; --i) {
            if (text[i - 1] == separator) return i;
        }
    }
    return 0;
}

// CombineURL's work; *cut is set when the result did not fit.
void Combine(char* out, const char* ref, const char* base, bool* cut) {
    out[0] = '\0';

    bool refAbsolute = false;
    for (const char* prefix : kAbsolutePrefixes) {
        if (strstr(ref, prefix) != nullptr) refAbsolute = true;
    }
    const bool baseHttp = strstr(base, "http://") != nullptr || strstr(base, "https://") != nullptr;
    const size_t baseLength = strlen(base);

    if (!baseHttp) {
        // A file path base: keep its directory, whichever separator it uses.
        if (!refAbsolute && !(ref[0] == '/' && base[0] == '/')) {
            AppendN(out, base, DirectoryLength(base, baseLength), cut);
        }
    } else if (!refAbsolute) {
        if (ref[0] != '/') {
            // A "/" inside the query is not part of the directory.
            const char* lastQuery = strrchr(base, '?');
            const char* lastSlash = strrchr(base, '/');
            size_t length = baseLength;
            if (lastQuery != nullptr && lastSlash != nullptr && lastSlash > lastQuery) {
                length = static_cast<size_t>(lastQuery - base);
            }
            size_t keep = 0;
            for (size_t i = length; i > 0; --i) {
                if (base[i - 1] == '/') {
                    keep = i;
                    break;
                }
            }
            AppendN(out, base, keep, cut);
        } else {
            // Origin only: the first "/" from position 8 on passes over "https://".
            const char* slash = baseLength > 8 ? strchr(base + 8, '/') : nullptr;
            AppendN(out, base, slash != nullptr ? static_cast<size_t>(slash - base) : baseLength,
                    cut);
        }
    }
    Append(out, ref, cut);
}

}  // namespace

uint32_t CombineURL(char* out, char* ref, char* base) {
    if (out == nullptr || ref == nullptr || base == nullptr) return 0;
    Combine(out, ref, base, nullptr);
    return 0;
}

namespace ka {

bool CombineUrlWhole(char* out, const char* ref, const char* base) {
    if (out == nullptr || ref == nullptr || base == nullptr) return false;
    bool cut = false;
    Combine(out, ref, base, &cut);
    return !cut;
}

}  // namespace ka

uint32_t GetComponentOfURI(char* scheme, char* authority, char* path, char* query, char* fragment,
                           char* uri) {
    if (uri == nullptr || uri[0] == '\0') return 0;

    const char* colon = strchr(uri, ':');
    bool hasScheme = false;
    if (colon != nullptr) {
        hasScheme = true;
        for (const char* p = uri; p < colon; ++p) {
            if (*p == '/' || *p == '?' || *p == '#') {
                hasScheme = false;
                break;
            }
        }
    }
    if (hasScheme) {
        AssignN(scheme, uri, static_cast<size_t>(colon - uri));
        if (colon[1] == '\0') return 0;
    }

    const char* rest = hasScheme ? colon : uri;
    const char* authorityStart = nullptr;
    const char* pathStart = nullptr;
    const char* doubleSlash = strstr(rest, "//");
    if (doubleSlash != nullptr) {
        authorityStart = doubleSlash + 2;
        const char* slash = strchr(authorityStart, '/');
        const char* authorityEnd;
        if (slash != nullptr) {
            authorityEnd = slash;
            pathStart = slash;
        } else {
            authorityEnd = strchr(authorityStart, '?');
            if (authorityEnd == nullptr) authorityEnd = strchr(authorityStart, '#');
            if (authorityEnd == nullptr) authorityEnd = authorityStart + strlen(authorityStart);
        }
        AssignN(authority, authorityStart, static_cast<size_t>(authorityEnd - authorityStart));
    } else {
        pathStart = hasScheme ? colon + 1 : uri;
    }

    const char* searchStart = pathStart != nullptr ? pathStart : authorityStart;
    const char* question = strchr(searchStart, '?');
    if (question != nullptr) {
        if (pathStart != nullptr) {
            AssignN(path, pathStart, static_cast<size_t>(question - pathStart));
        }
        const char* hash = strchr(question + 1, '#');
        const char* queryEnd = hash != nullptr ? hash : question + 1 + strlen(question + 1);
        AssignN(query, question + 1, static_cast<size_t>(queryEnd - (question + 1)));
    } else if (pathStart != nullptr) {
        const char* hash = strchr(pathStart, '#');
        const char* pathEnd = hash != nullptr ? hash : pathStart + strlen(pathStart);
        AssignN(path, pathStart, static_cast<size_t>(pathEnd - pathStart));
    }

    const char* hash = strchr(question != nullptr ? question : searchStart, '#');
    if (hash != nullptr) AssignN(fragment, hash + 1, strlen(hash + 1));
    return 0;
}

uint32_t RemoveDotSegments(char* out, char* in) {
    if (out == nullptr || in == nullptr) return 0;
    char* p = in;
    // Every step consumes at least one character, so the loop ends.
    while (*p != '\0') {
        if (strncmp(p, "./", 2) == 0) {
            p += 2;
        } else if (strncmp(p, "../", 3) == 0) {
            p += 3;
        } else if (strncmp(p, "/./", 3) == 0) {
            p += 2;
        } else if (strcmp(p, "/.") == 0) {
            p[1] = '/';
            p += 1;
        } else if (strncmp(p, "/../", 4) == 0 || strcmp(p, "/..") == 0) {
            if (p[3] == '\0') {
                p[2] = '/';
                p += 2;
            } else {
                p += 3;
            }
            char* lastSlash = strrchr(out, '/');
            if (lastSlash != nullptr) {
                *lastSlash = '\0';
            } else {
                out[0] = '\0';
            }
        } else if (strcmp(p, ".") == 0 || strcmp(p, "..") == 0) {
            break;
        } else {
            // The first segment with its leading "/", up to the next "/".
            const char* next = strchr(p + 1, '/');
            size_t length = next != nullptr ? static_cast<size_t>(next - p) : strlen(p);
            AppendN(out, p, length);
            p += length;
        }
    }
    return 0;
}

uint32_t MergeURIPath(char* out, char* baseAuthority, char* basePath, char* refPath) {
    if (out == nullptr) return 0;
    out[0] = '\0';
    if (Present(baseAuthority) && !Present(basePath)) {
        Append(out, "/");
        Append(out, refPath);
        return 0;
    }
    const char* lastSlash = basePath != nullptr ? strrchr(basePath, '/') : nullptr;
    if (lastSlash != nullptr) AppendN(out, basePath, static_cast<size_t>(lastSlash - basePath) + 1);
    Append(out, refPath);
    return 0;
}

uint32_t GeneateURI(char* scheme, char* authority, char* path, char* query, char* fragment,
                    char* out) {
    if (out == nullptr) return 0;
    out[0] = '\0';
    if (Present(scheme)) {
        Append(out, scheme);
        Append(out, ":");
    }
    if (Present(authority)) {
        Append(out, "//");
        Append(out, authority);
    }
    Append(out, path);
    if (Present(query)) {
        Append(out, "?");
        Append(out, query);
    }
    if (Present(fragment)) {
        Append(out, "#");
        Append(out, fragment);
    }
    return 0;
}

uint32_t ResolveURI(char* out, char* ref, char* base) {
    if (out == nullptr) return 0;
    if (!Present(base)) {
        if (ref != nullptr) AssignN(out, ref, strnlen(ref, kMaxLength));
        return 0;
    }

    char scheme[ka::kUrlSize] = {};
    char authority[ka::kUrlSize] = {};
    char path[ka::kUrlSize] = {};
    char query[ka::kUrlSize] = {};
    char fragment[ka::kUrlSize] = {};
    char target[ka::kUrlSize] = {};
    GetComponentOfURI(scheme, authority, path, query, fragment, ref);

    if (Present(scheme)) {
        RemoveDotSegments(target, path);
    } else {
        GetComponentOfURI(scheme, nullptr, nullptr, nullptr, nullptr, base);
        if (Present(authority)) {
            RemoveDotSegments(target, path);
        } else {
            GetComponentOfURI(nullptr, authority, nullptr, nullptr, nullptr, base);
            if (path[0] == '/') {
                RemoveDotSegments(target, path);
            } else if (path[0] != '\0') {
                char baseAuthority[ka::kUrlSize] = {};
                char basePath[ka::kUrlSize] = {};
                char merged[ka::kUrlSize] = {};
                GetComponentOfURI(nullptr, baseAuthority, basePath, nullptr, nullptr, base);
                MergeURIPath(merged, baseAuthority, basePath, path);
                RemoveDotSegments(target, merged);
            } else {
                GetComponentOfURI(nullptr, nullptr, path, nullptr, nullptr, base);
                if (query[0] == '\0') {
                    GetComponentOfURI(nullptr, nullptr, nullptr, query, nullptr, base);
                }
            }
        }
    }
    if (target[0] != '\0') AssignN(path, target, strlen(target));
    GeneateURI(scheme, authority, path, query, fragment, out);
    return 0;
}
