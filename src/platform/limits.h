// Every fixed size and bound of the library in one place, each with the reason it exists.
#pragma once

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

}  // namespace ka
