// Second process for the named-flag test: threading_flag_peer.exe <name>
// Checks that "<name>.parent", set by the test, is set here too, clears it, sets "<name>.child"
// and waits for "<name>.go". Exit code: 0 done, 1 bad usage, 2 the parent's value was not seen,
// 3 no go within 20 s.
#include "KelvraThread.h"

#include <string>

int main(int argc, char** argv)
{
    if (argc != 2)
        return 1;
    const std::string narrow(argv[1]);
    const std::wstring name(narrow.begin(), narrow.end());

    KelvraCsThread::CGlobalBooleanFx2 parent((name + L".parent").c_str());
    KelvraCsThread::CGlobalBooleanFx2 child((name + L".child").c_str());
    KelvraCsThread::CGlobalBooleanFx2 go((name + L".go").c_str());
    if (!parent)
        return 2;
    parent = false;
    child = true;
    return go.Wait(20000) ? 0 : 3;
}
