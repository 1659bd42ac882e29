// Second process for the named-flag test: threading_flag_peer.exe <name> clears the flag of that
// name, which the test has set. Exit code: 0 done, 1 bad usage, 2 the flag was clear here.
#include "KelvraThread.h"

#include <string>

int main(int argc, char** argv)
{
    if (argc != 2)
        return 1;
    const std::string name(argv[1]);
    KelvraCsThread::CGlobalBooleanFx2 flag(std::wstring(name.begin(), name.end()).c_str());
    const bool wasSet = flag;
    flag = false;
    return wasSet ? 0 : 2;
}
