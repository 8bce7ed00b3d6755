// Every fixed size and bound of the library in one place, each with the reason it exists.
#pragma once

#include <cstddef>

namespace ka {

// Module names and paths (working path + "lib" + name + ".so") fit in this many bytes.
constexpr int kModuleNameSize = 256;
// Entry-function names of the modules.
constexpr int kEntryNameSize = 128;
// The CPU-variant ending of a module file ("_v7.so").
constexpr int kLibSuffixSize = 32;
// URLs and URL components.
constexpr int kUrlSize = 2048;
// Every document load passes this mode to the XML module.
constexpr int kXmlLoadMode = 160;
// A wrapper chain follows at most this many hops below the caller's document.
constexpr unsigned int kMaxWrapperDepth = 10;

// The records' arena (arena.h). Its first chunk; each new one is as large as all before it
// together, up to the largest, so that no document makes one chunk unbounded.
constexpr size_t kArenaFirstChunk = 1024;
constexpr size_t kArenaMaxChunk = 64 * 1024;
// A request larger than this gets a block of its own, freed at the next Reset: a long text
// neither makes a chunk unbounded nor wastes the rest of one.
constexpr size_t kArenaOwnBlockBytes = 4 * 1024;
// What a handle keeps between Processes; a larger set of records is rebuilt in fresh chunks.
constexpr size_t kArenaKeptBytes = 2 * 1024 * 1024;

}  // namespace ka
