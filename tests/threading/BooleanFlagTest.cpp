#include "KelvraThread.h"
#include "ThreadingSupport.h"
#include "common/UniqueHandle.h"

#include <gtest/gtest.h>

#include <windows.h>

#include <process.h>

#include <functional>
#include <string>
#include <thread>
#include <utility>

namespace
{

using KelvraCsThread::CAutoBoolean;
using KelvraCsThread::CGlobalBooleanFx2;
using KelvraCsThread::CInterlockedBooleanFx2;
using KelvraTest::Milliseconds;
using KelvraTest::ThrownLiteral;

// A name no other test run on this machine uses.
std::wstring UniqueObjectName(const wchar_t* purpose)
{
    return L"Kelvra.Threading." + std::to_wstring(::GetCurrentProcessId()) + L"." + purpose;
}

// Three reads in a row: '1' set, '0' clear.
std::string Reads(const CGlobalBooleanFx2& flag)
{
    std::string values;
    for (int i = 0; i < 3; ++i)
        values += flag ? '1' : '0';
    return values;
}

TEST(FlagValue, FollowsTheResetModeOfItsClass)
{
    CGlobalBooleanFx2 global(nullptr);
    CInterlockedBooleanFx2 interlocked;
    CAutoBoolean automatic;
    const struct
    {
        const char* name;
        CGlobalBooleanFx2& flag;
        const char* afterSet;
    } cases[] = {{"CGlobalBooleanFx2", global, "111"},
                 {"CInterlockedBooleanFx2", interlocked, "111"},
                 {"CAutoBoolean", automatic, "100"}};
    for (const auto& c : cases)
    {
        EXPECT_EQ("000", Reads(c.flag)) << c.name << ", new";
        c.flag = true;
        EXPECT_EQ(c.afterSet, Reads(c.flag)) << c.name << ", set once";
        c.flag = true;
        c.flag = true;
        EXPECT_EQ(c.afterSet, Reads(c.flag)) << c.name << ", set twice: an event does not count";
        c.flag = false;
        EXPECT_EQ("000", Reads(c.flag)) << c.name << ", cleared";
    }
}

TEST(FlagValue, CopyConstructionIsRefused)
{
    const std::wstring refusal = KelvraTest::kFlagCopyRefusal;
    CGlobalBooleanFx2 global(nullptr);
    CInterlockedBooleanFx2 interlocked;
    CAutoBoolean automatic;
    EXPECT_EQ(refusal, ThrownLiteral<wchar_t>([&] { CGlobalBooleanFx2 copy(global); }));
    EXPECT_EQ(refusal, ThrownLiteral<wchar_t>([&] { CInterlockedBooleanFx2 copy(interlocked); }));
    EXPECT_EQ(refusal, ThrownLiteral<wchar_t>([&] { CAutoBoolean copy(automatic); }));
}

TEST(AutoBoolean, EveryReadingOperationConsumesTheSetValue)
{
    CInterlockedBooleanFx2 set;
    set = true;
    CAutoBoolean target;
    const std::pair<const char*, std::function<bool(CAutoBoolean&)>> reads[] = {
        {"bool", [](CAutoBoolean& flag) { return static_cast<bool>(flag); }},
        {"Wait(0)", [](CAutoBoolean& flag) { return flag.Wait(0); }},
        {"Wait(-1)", [](CAutoBoolean& flag) { return flag.Wait(-1); }},
        {"==", [&](CAutoBoolean& flag) { return flag == set; }},
        {"assignment source", [&](CAutoBoolean& flag) { return (target = flag).Wait(0); }},
    };
    for (const auto& read : reads)
    {
        CAutoBoolean flag;
        flag = true;
        EXPECT_TRUE(read.second(flag)) << read.first << " did not see the flag set";
        EXPECT_FALSE(flag.Wait(0)) << read.first << " left the flag set";
    }
}

TEST(FlagEquality, TrueWhenBothSetOrBothClear)
{
    CInterlockedBooleanFx2 left;
    CGlobalBooleanFx2 right(nullptr);
    for (bool leftValue : {false, true})
        for (bool rightValue : {false, true})
        {
            left = leftValue;
            right = rightValue;
            EXPECT_EQ(leftValue == rightValue, left == right) << leftValue << " == " << rightValue;
        }
}

// An automatic source: see AutoBoolean.EveryReadingOperationConsumesTheSetValue.
TEST(FlagAssignment, CopiesTheValueNotTheEventAndReturnsTheTarget)
{
    CInterlockedBooleanFx2 source, target;
    source = true;
    EXPECT_EQ(&target, &(target = source));
    EXPECT_TRUE(source) << "a manual source lost its value";
    source = false;
    EXPECT_TRUE(target) << "the target was not set, or is tied to the source";
    target = source;
    EXPECT_FALSE(target);
}

TEST(FlagWait, TimesOutOnAClearFlag)
{
    CInterlockedBooleanFx2 flag;
    EXPECT_LT(Milliseconds([&] { EXPECT_FALSE(flag.Wait(0)); }), 1000u) << "Wait(0) did not return at once";
    EXPECT_GE(Milliseconds([&] { EXPECT_FALSE(flag.Wait(200)); }), 150u);
}

TEST(FlagWait, NegativeTimeoutWaitsUntilAnotherThreadSetsTheFlag)
{
    for (int timeout : {-1, -1000})
    {
        CInterlockedBooleanFx2 flag;
        std::thread setter(
            [&]
            {
                ::Sleep(150);
                flag = true;
            });
        EXPECT_GE(Milliseconds([&] { EXPECT_TRUE(flag.Wait(timeout)) << timeout; }), 100u) << timeout;
        setter.join();
    }
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
    EXPECT_LT(Milliseconds([&] { EXPECT_FALSE(flag.Wait(-1)); }), 1000u);
}

TEST(NamedFlag, ObjectsOfOneNameShareTheValueAcrossProcesses)
{
    const std::wstring name = UniqueObjectName(L"shared");
    CGlobalBooleanFx2 first(name.c_str());
    first = true;
    CGlobalBooleanFx2 second(name.c_str());
    EXPECT_EQ(static_cast<DWORD>(ERROR_ALREADY_EXISTS), ::GetLastError());
    EXPECT_TRUE(second) << "opening an existing name lost its value";
    EXPECT_FALSE(CGlobalBooleanFx2(UniqueObjectName(L"unrelated").c_str()));
    // The peer, beside this program, clears the flag once it has found it set.
    wchar_t path[MAX_PATH] = {};
    std::wstring peer(path, ::GetModuleFileNameW(nullptr, path, MAX_PATH));
    peer = peer.substr(0, peer.find_last_of(L'\\') + 1) + L"threading_flag_peer.exe";
    const intptr_t exitCode =
        ::_wspawnl(_P_WAIT, peer.c_str(), (L'"' + peer + L'"').c_str(), name.c_str(), nullptr);
    EXPECT_EQ(0, exitCode) << "-1: the peer did not start, 2: it did not see the value set here";
    EXPECT_FALSE(first) << "the peer's clear did not reach this process";
    EXPECT_FALSE(second);
}

} // namespace
