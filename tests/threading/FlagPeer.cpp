// Second process for the named-flag test: threading_flag_peer.exe <name>
// Finds the flag of that name set by the test and clears it, for the test to see. Exit code: 0 done,
// 1 bad usage, 2 the flag was clear here.
#include "KelvraThread.h"

#include <string>

int main(int argc, char** argv)
{
    if (argc != 2)
        return 1;
    const std::string name(argv[1]);
    KelvraCsThread::CGlobalBooleanFx2 flag(std::wstring(name.begin(), name.end()).c_str());
    if (!flag)
        return 2;
    flag = false;
    return 0;
}
