// Entries in the Windows application event log under the source "KelvraSDK".
#pragma once

#include "KelvraApi.h"

// Registers the source "KelvraSDK" (message and category files: the host's executable) and
// opens it. One object serves one thread at a time; it owns its source handle and cannot be
// copied. Registry entries outlive the object: only RemoveEventSource deletes them.
class KELVRA_API COSEventLog
{
public:
    // Calls InitializeEventLog.
    COSEventLog();
    ~COSEventLog();
    COSEventLog(const COSEventLog&) = delete;
    COSEventLog& operator=(const COSEventLog&) = delete;

    // Registers "KelvraSDK" with 3 categories (a failure, e.g. for want of administrative
    // rights, is ignored) and opens it, closing a source this object still held. Always true;
    // when the source cannot be opened, Log reports nothing.
    bool InitializeEventLog();
    // Closes the source; Log then returns false until InitializeEventLog. Always true.
    bool UnInitializeEventLog();

    // Writes HKLM\SYSTEM\CurrentControlSet\Services\EventLog\Application\<name>:
    // EventMessageFile (this process's executable) and TypesSupported = 7, plus
    // CategoryMessageFile and CategoryCount when categoryCount > 0. Returns 0 or the Windows
    // error code of the step that failed; 87, touching nothing, for a null or empty name or one
    // holding a backslash.
    unsigned long AddEventSource(const wchar_t* name, unsigned long categoryCount);
    // Deletes that key (it must have no subkeys). Returns 0 or the Windows error code, 2 for a
    // name never registered, 87 (as above) for a name that is no source name.
    unsigned long RemoveEventSource(const wchar_t* name);

    // Reports one entry with the current user's security identifier. type: 1 error, 2 warning,
    // 4 information, 8 audit success, 16 audit failure; category from 1. The message is
    // printf-style with Microsoft rules (%s takes a wide string), formatted into a buffer of
    // 4096 characters and so cut to 4095. False when no source is open, the format cannot be
    // expanded or the report fails. Never throws.
    bool Log(unsigned short type, unsigned short category, unsigned long eventId, const wchar_t* format, ...);

protected:
    // The security identifier of the user the calling thread runs as, in a buffer stored through
    // sid and also returned; the caller releases it with LocalFree. Null (and *sid null) when it
    // cannot be found; null at once when sid is null.
    void* GetUserSID(void** sid);

private:
    void* m_source; // event source handle, null when closed
};
