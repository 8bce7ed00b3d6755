// What the benchmark programs share: the four measured documents, the library reached as a
// player reaches it (dlopen, kaGetVMAPParserAPI, Open with the modules folder), and the XML
// module reached directly, for the time and memory of its own load of the same buffer.
#pragma once

#include <benchmark/benchmark.h>

#include <cstddef>
#include <map>
#include <string>
#include <vector>

#include "ka/vmap_parser_api.h"
#include "xml_parser_api.h"

namespace bench {

// One measured case: its buffers are read in turn, each once per iteration, on one handle.
struct Document {
    std::string name;
    std::vector<std::string> buffers;
    bool vastOnly;         // bare VAST documents, processed in VAST-only mode
    size_t Bytes() const;  // of all buffers
};

// The four cases: two VAST InLine responses of 2 and 3 KB in turn (what ad servers mostly
// send), a 4 KB VAST InLine, a 40 KB VMAP of six inline-VAST breaks, and a 1 MB playlist of 200
// breaks generated on first use. Exits the program when a file is missing.
const std::vector<Document>& Documents();

// Takes "--lib PATH" (the library) and "--modules DIR" (its modules folder, ending with "/")
// out of the arguments; without them this build's own are used. Call before anything loads.
void TakePathOptions(int& argc, char** argv);

// The 1 MB playlist: breaks copies of one inline-VAST break, each with its own identifiers.
std::string MakePlaylist(const std::string& vastDocument, int breaks);

// The parser's table from the library (KA_LIB_PATH or --lib); it stays loaded for the program's
// lifetime.
const VMAPParserAPI& Library();

// As the host does for a local document: the source-IO module instance the library loads (the
// same file, so the same object) may read local files, relative ones below baseDir when given.
void AllowLocalFiles(const char* baseDir);

// One opened handle of the library, in VAST-only mode when asked; closed by the destructor.
class ParserHandle {
public:
    explicit ParserHandle(bool vastOnly, bool readExtras = true);
    ~ParserHandle();
    ParserHandle(const ParserHandle&) = delete;
    ParserHandle& operator=(const ParserHandle&) = delete;
    uint32_t Process(const std::string& document);
    // Each buffer of the case once; the last result that was not 0, else 0.
    uint32_t ProcessAll(const Document& document);

private:
    void* mHandle = nullptr;
};

// The XML module of the modules folder (KA_MODULES_DIR or --modules), loaded directly, with one
// handle of its own.
class XmlModule {
public:
    XmlModule();
    ~XmlModule();
    XmlModule(const XmlModule&) = delete;
    XmlModule& operator=(const XmlModule&) = delete;
    unsigned int Load(const std::string& document);
    unsigned int LoadAll(const Document& document);

private:
    void* mLibrary = nullptr;
    void* mHandle = nullptr;
    XMLParserAPI mApi{};
};

// A console reporter that also keeps, per benchmark name, the lowest CPU time per iteration
// (in ns) and the last value of every counter, so that a summary can be printed after the run.
class KeepingReporter : public benchmark::ConsoleReporter {
public:
    void ReportRuns(const std::vector<Run>& runs) override;
    double CpuTime(const std::string& name) const;
    double Counter(const std::string& name, const std::string& counter) const;

private:
    std::map<std::string, double> mCpuTime;
    std::map<std::string, std::map<std::string, double>> mCounters;
};

}  // namespace bench
