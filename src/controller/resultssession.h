#pragma once

#include "harness.h"

// Holds the processed-results document in memory for the lifetime of a Run
// or Process call, so the file is read once rather than for every module.
// With deferSave the document is written once, when the session ends;
// otherwise after every module. A session inside another one (Process
// descending into a sub-folder) leaves the outer one in charge.
class Harness::ResultsSession
{
public:
    ResultsSession(Harness &harness, bool deferSave);
    ~ResultsSession();
    ResultsSession(const ResultsSession &) = delete;
    ResultsSession &operator=(const ResultsSession &) = delete;

private:
    Harness &m_harness;
    bool m_owner;
};
