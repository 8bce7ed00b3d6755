// What the recording XML parser module saw, read by the tests through "fake_xml_state".
#pragma once

#include <stdint.h>

#include "xml_parser_api.h"

struct FakeXmlState {
    int initCalls;
    int uninitCalls;
    // What Init answers, and the handle it writes (a fresh one per call when null).
    unsigned int initResult;
    void* initHandle;
    XMLInitData lastInit;
    void* lastUninitHandle;
    // The slot (2 to 12) last called, the handle and the arguments after it, in order.
    int lastSlot;
    void* lastHandle;
    intptr_t lastArgs[7];
};

// Every slot from 2 to 12 answers this base plus its slot number.
constexpr unsigned int kFakeXmlResultBase = 0x7000u;

typedef FakeXmlState* (*FakeXmlStateFn)();
