// A host that logs through the DLL as users do. Wine stores no entry but prints each reported
// string on standard error (channel eventlog), where CheckReportedEntries.cmake reads it.
#include <Kelvra.h>

#include <cstdio>

int main()
{
    COSEventLog log;
    // Category 2 is the warning type: an error entry passed with the two swapped shows as a warning.
    const bool error = log.Log(1, 2, 1001, L"error entry %s #%d", L"disk full", 42);
    const bool warning = log.Log(2, 2, 1002, L"warning entry %s", L"low memory");
    const bool information = log.Log(4, 3, 1003, L"information entry %d%% %hs", 75, "done");
    log.UnInitializeEventLog();
    const bool closed = log.Log(1, 1, 1004, L"closed entry %s", L"must not appear");
    log.InitializeEventLog();
    const bool reopened = log.Log(1, 1, 1005, L"reopened entry %s", L"after initialisation");
    const unsigned long removed = log.RemoveEventSource(L"KelvraSDK");
    std::printf("results %d %d %d %d %d removed %lu\n", error, warning, information, closed, reopened, removed);
    return 0;
}
