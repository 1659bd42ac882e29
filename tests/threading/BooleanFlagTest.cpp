#include "KelvraThread.h"
#include "ThreadingSupport.h"
#include "common/UniqueHandle.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <functional>
#include <string>
#include <thread>
#include <type_traits>
#include <vector>

namespace
{

using KelvraCsThread::CAutoBoolean;
using KelvraCsThread::CGlobalBooleanFx2;
using KelvraCsThread::CInterlockedBooleanFx2;
using KelvraTest::Stopwatch;
using KelvraTest::UniqueObjectName;

const wchar_t* const kCopyRefusal = L"You can't use CGlobalBooleanFx2::CGlobalBooleanFx2 copy constructor";

template <typename Flag>
Flag MakeFlag()
{
    return Flag();
}

template <>
CGlobalBooleanFx2 MakeFlag<CGlobalBooleanFx2>()
{
    return CGlobalBooleanFx2(nullptr);
}

// Reads a flag n times in a row.
std::vector<bool> Reads(const CGlobalBooleanFx2& flag, int count)
{
    std::vector<bool> values;
    for (int i = 0; i < count; ++i)
        values.push_back(static_cast<bool>(flag));
    return values;
}

template <typename Flag>
class FlagValue : public testing::Test
{
protected:
    static constexpr bool kAutomatic = std::is_same<Flag, CAutoBoolean>::value;
};

using FlagClasses = testing::Types<CGlobalBooleanFx2, CInterlockedBooleanFx2, CAutoBoolean>;
TYPED_TEST_SUITE(FlagValue, FlagClasses);

TYPED_TEST(FlagValue, FollowsTheResetModeOfItsClass)
{
    TypeParam flag = MakeFlag<TypeParam>();
    EXPECT_EQ(std::vector<bool>({false, false}), Reads(flag, 2)) << "new";
    flag = true;
    const std::vector<bool> afterSet =
        TestFixture::kAutomatic ? std::vector<bool>{true, false, false} : std::vector<bool>{true, true, true};
    EXPECT_EQ(afterSet, Reads(flag, 3)) << "set once";
    flag = true;
    flag = true;
    const std::vector<bool> afterSetTwice =
        TestFixture::kAutomatic ? std::vector<bool>{true, false} : std::vector<bool>{true, true};
    EXPECT_EQ(afterSetTwice, Reads(flag, 2)) << "set twice: an event does not count";
    flag = false;
    EXPECT_EQ(std::vector<bool>({false, false}), Reads(flag, 2)) << "cleared";
}

TYPED_TEST(FlagValue, CopyConstructionIsRefused)
{
    TypeParam original = MakeFlag<TypeParam>();
    try
    {
        TypeParam copy(original);
        ADD_FAILURE() << "no exception";
    }
    catch (const wchar_t* text)
    {
        EXPECT_STREQ(kCopyRefusal, text);
    }
    catch (...)
    {
        ADD_FAILURE() << "an exception of another type";
    }
}

// Every way of reading an automatic flag, each answering whether it saw the flag set.
struct ReadingOperation
{
    const char* name;
    std::function<bool(CAutoBoolean&)> read;
};

class AutoBooleanRead : public testing::TestWithParam<ReadingOperation>
{
};

TEST_P(AutoBooleanRead, ConsumesTheSetValue)
{
    CAutoBoolean flag;
    flag = true;
    EXPECT_TRUE(GetParam().read(flag)) << "the first read sees the flag set";
    EXPECT_FALSE(flag.Wait(0)) << "the read left the flag set";
}

bool CompareWithASetFlag(CAutoBoolean& flag)
{
    CInterlockedBooleanFx2 set;
    set = true;
    return flag == set;
}

bool CopyIntoAnotherFlag(CAutoBoolean& flag)
{
    CInterlockedBooleanFx2 target;
    target = flag;
    return static_cast<bool>(target);
}

INSTANTIATE_TEST_SUITE_P(
    EveryOperation, AutoBooleanRead,
    testing::Values(ReadingOperation{"BoolConversion", [](CAutoBoolean& f) { return static_cast<bool>(f); }},
                    ReadingOperation{"WaitZero", [](CAutoBoolean& f) { return f.Wait(0); }},
                    ReadingOperation{"WaitWithoutLimit", [](CAutoBoolean& f) { return f.Wait(-1); }},
                    ReadingOperation{"Equality", &CompareWithASetFlag},
                    ReadingOperation{"AssignmentSource", &CopyIntoAnotherFlag}),
    [](const testing::TestParamInfo<ReadingOperation>& info) { return std::string(info.param.name); });

struct EqualityCase
{
    bool left;
    bool right;
    bool equal;
};

TEST(FlagEquality, TrueWhenBothSetOrBothClear)
{
    const EqualityCase cases[] = {{true, true, true}, {false, false, true}, {true, false, false}, {false, true, false}};
    for (const EqualityCase& c : cases)
    {
        CInterlockedBooleanFx2 left;
        CGlobalBooleanFx2 right(nullptr);
        left = c.left;
        right = c.right;
        EXPECT_EQ(c.equal, left == right) << c.left << " == " << c.right;
        EXPECT_EQ(c.left, static_cast<bool>(left)) << "a manual flag keeps its value when compared";
    }
}

TEST(FlagAssignment, CopiesTheValueAndKeepsEachEvent)
{
    CInterlockedBooleanFx2 source;
    CInterlockedBooleanFx2 target;
    source = true;
    CInterlockedBooleanFx2& result = (target = source);
    EXPECT_EQ(&target, &result);
    EXPECT_TRUE(target);
    EXPECT_TRUE(source) << "a manual source keeps its value";
    EXPECT_NE(source.GetEvent(), target.GetEvent());

    source = false;
    EXPECT_TRUE(target) << "the target is not tied to the source";
    target = source;
    EXPECT_FALSE(target);
}

TEST(FlagAssignment, AutomaticSourceSetsTheTargetAndIsCleared)
{
    CAutoBoolean source;
    CAutoBoolean target;
    source = true;
    CAutoBoolean& result = (target = source);
    EXPECT_EQ(&target, &result);
    EXPECT_FALSE(source.Wait(0));
    EXPECT_TRUE(target);
}

TEST(FlagWait, ZeroOnAClearFlagReturnsFalseAtOnce)
{
    CInterlockedBooleanFx2 flag;
    const Stopwatch watch;
    EXPECT_FALSE(flag.Wait(0));
    EXPECT_LT(watch.Milliseconds(), 1000);
}

TEST(FlagWait, TimesOutOnAClearFlag)
{
    CInterlockedBooleanFx2 flag;
    const Stopwatch watch;
    EXPECT_FALSE(flag.Wait(200));
    EXPECT_GE(watch.Milliseconds(), 150);
}

TEST(FlagWait, NegativeTimeoutWaitsUntilAnotherThreadSetsTheFlag)
{
    for (int timeout : {-1, -1000})
    {
        CInterlockedBooleanFx2 flag;
        std::thread setter([&] {
            ::Sleep(150);
            flag = true;
        });
        const Stopwatch watch;
        EXPECT_TRUE(flag.Wait(timeout)) << timeout;
        EXPECT_GE(watch.Milliseconds(), 100) << timeout;
        setter.join();
    }
}

TEST(FlagWait, SettingAnAutoBooleanReleasesExactlyOneWaiter)
{
    CAutoBoolean flag;
    bool released[2] = {false, false};
    std::thread first([&] { released[0] = flag.Wait(1000); });
    std::thread second([&] { released[1] = flag.Wait(1000); });
    ::Sleep(100);
    flag = true;
    first.join();
    second.join();
    EXPECT_NE(released[0], released[1]);
}

TEST(FlagWait, EventServesWaitsOnSeveralObjects)
{
    CInterlockedBooleanFx2 idle;
    CAutoBoolean ready;
    ready = true;
    const HANDLE events[] = {idle.GetEvent(), ready.GetEvent()};
    EXPECT_EQ(WAIT_OBJECT_0 + 1, ::WaitForMultipleObjects(2, events, FALSE, 1000));
    EXPECT_FALSE(ready) << "the wait consumed the automatic flag";
}

TEST(NamedFlag, ObjectsOfOneNameShareTheValue)
{
    const std::wstring name = UniqueObjectName(L"shared");
    CGlobalBooleanFx2 first(name.c_str());
    CGlobalBooleanFx2 second(name.c_str());
    CGlobalBooleanFx2 unrelated(UniqueObjectName(L"unrelated").c_str());
    first = true;
    EXPECT_TRUE(second);
    EXPECT_FALSE(unrelated);
    second = false;
    EXPECT_FALSE(first);
}

TEST(NamedFlag, OpeningAnExistingNameKeepsItsValue)
{
    const std::wstring name = UniqueObjectName(L"existing");
    CGlobalBooleanFx2 creator(name.c_str());
    creator = true;
    CGlobalBooleanFx2 opener(name.c_str());
    EXPECT_EQ(static_cast<DWORD>(ERROR_ALREADY_EXISTS), ::GetLastError());
    EXPECT_TRUE(opener);
}

TEST(NamedFlag, UnusableNameGivesAFlagWithoutEvent)
{
    const std::wstring name = UniqueObjectName(L"taken");
    const Kelvra::UniqueMutex mutex(::CreateMutexW(nullptr, FALSE, name.c_str()));
    ASSERT_TRUE(mutex);
    CGlobalBooleanFx2 flag(name.c_str());
    EXPECT_EQ(static_cast<DWORD>(ERROR_INVALID_HANDLE), ::GetLastError());
    EXPECT_EQ(nullptr, flag.GetEvent());
    flag = true;
    EXPECT_FALSE(flag);
    const Stopwatch watch;
    EXPECT_FALSE(flag.Wait(-1));
    EXPECT_LT(watch.Milliseconds(), 1000);
}

std::wstring PeerProgram()
{
    wchar_t path[MAX_PATH] = {};
    const DWORD length = ::GetModuleFileNameW(nullptr, path, MAX_PATH);
    std::wstring folder(path, length);
    return folder.substr(0, folder.find_last_of(L'\\') + 1) + L"threading_flag_peer.exe";
}

// The peer opens "<name>.parent", "<name>.child" and "<name>.go" (see FlagPeer.cpp).
TEST(NamedFlag, IsSharedWithAnotherProcess)
{
    const std::wstring name = UniqueObjectName(L"peer");
    CGlobalBooleanFx2 parent((name + L".parent").c_str());
    CGlobalBooleanFx2 child((name + L".child").c_str());
    CGlobalBooleanFx2 go((name + L".go").c_str());
    parent = true;

    std::wstring commandLine = L"\"" + PeerProgram() + L"\" " + name;
    STARTUPINFOW startup = {};
    startup.cb = sizeof(startup);
    PROCESS_INFORMATION created = {};
    ASSERT_TRUE(::CreateProcessW(nullptr, &commandLine[0], nullptr, nullptr, FALSE, 0, nullptr, nullptr,
                                 &startup, &created))
        << "cannot start the peer, error " << ::GetLastError();
    const Kelvra::UniqueProcess process(created.hProcess);
    const Kelvra::UniqueThread mainThread(created.hThread);

    EXPECT_TRUE(child.Wait(20000)) << "the peer never set its flag";
    EXPECT_FALSE(parent) << "the peer's clear did not reach this process";
    go = true;
    if (::WaitForSingleObject(process.get(), 20000) != WAIT_OBJECT_0)
    {
        ::TerminateProcess(process.get(), 1);
        FAIL() << "the peer did not end";
    }
    DWORD exitCode = 1;
    ::GetExitCodeProcess(process.get(), &exitCode);
    EXPECT_EQ(0u, exitCode) << "2: the peer did not see the value set here, 3: it never saw go";
}

} // namespace
