// Helpers the threading tests share.
#pragma once

#include <windows.h>

#include <string>

namespace KelvraTest
{

// What the copy constructors of the flags and of the worker thread throw.
constexpr const wchar_t* kFlagCopyRefusal =
    L"You can't use CGlobalBooleanFx2::CGlobalBooleanFx2 copy constructor";

// The string literal (a const Char*) that action throws; empty when it throws nothing or something else.
template <typename Char, typename Action> std::basic_string<Char> ThrownLiteral(Action action)
{
    try
    {
        action();
    }
    catch (const Char* text)
    {
        return text;
    }
    catch (...)
    {
    }
    return {};
}

// How long action took, in milliseconds.
template <typename Action> ULONGLONG Milliseconds(Action action)
{
    const ULONGLONG start = ::GetTickCount64();
    action();
    return ::GetTickCount64() - start;
}

} // namespace KelvraTest
