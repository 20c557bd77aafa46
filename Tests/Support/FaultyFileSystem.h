// The local file system, of which the n-th call that reaches the disk fails: once or from then on, wholly or by
// delivering only half; or has something happen to the world at that moment. A test raises n until a run meets no
// fault:
//
//   FaultyFileSystem faults;                       // serves every path as long as it lives
//   for (int n = 1; faults.Arm(n, kind), Run(), faults.HasStruck(); ++n) ...
#pragma once

#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"
#ifdef VARNEX_WITH_OSX_BACK_END
#include "PlatformDependent/OSX/LocalFileSystemOSX.h"
using LocalBackEnd = LocalFileSystemOSX;
#else
#include "Runtime/VirtualFileSystem/LocalFileSystemPosix.h"
using LocalBackEnd = LocalFileSystemPosix;
#endif

#include <functional>

struct FaultKind {
    bool isLasting; // every call from the n-th on fails
    bool isShort;   // reads and writes deliver half of what was asked, and succeed; other calls are left alone
};

class FaultyFileSystem : public LocalBackEnd {
public:
    FaultyFileSystem() { GetFileSystem()->RegisterHandler(this); }
    ~FaultyFileSystem() override { GetFileSystem()->UnregisterHandler(this); }

    // Makes the n-th call from now on fail.
    void Arm(int n, FaultKind kind) {
        m_CallsLeft = n;
        m_Kind = kind;
    }
    // Whether one has failed since.
    bool HasStruck() const { return m_CallsLeft <= 0; }

    // Instead of failing, the call that is due runs this first, and goes on.
    std::function<void()> action;

    using LocalBackEnd::Read, LocalBackEnd::Write; // at a position: a seek and a transfer
    bool Read(FileEntryData& entry, UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) override {
        *actual = 0;
        return !Strikes(entry, &size) && LocalBackEnd::Read(entry, size, buffer, actual, flags);
    }
    bool Write(FileEntryData& entry, UInt64 size, const void* buffer, UInt64* written) override {
        *written = 0;
        return !Strikes(entry, &size) && LocalBackEnd::Write(entry, size, buffer, written);
    }
    bool Open(FileEntryData& entry, FilePermission permission, FileAutoBehavior behavior) override {
        return !Strikes(entry) && LocalBackEnd::Open(entry, permission, behavior);
    }
    bool Seek(FileEntryData& entry, VFS::FileOffset offset, FileOrigin origin) override {
        return !Strikes(entry) && LocalBackEnd::Seek(entry, offset, origin);
    }
    bool Close(FileEntryData& entry) override { return LocalBackEnd::Close(entry) && !Strikes(entry); }
    bool CreateAsDir(FileEntryData& entry) override { return !Strikes(entry) && LocalBackEnd::CreateAsDir(entry); }
    DateTime LastModified(const FileEntryData& entry) const override {
        return Strikes(entry) ? DateTime{} : LocalBackEnd::LastModified(entry);
    }
    FileEntryInfoQueryFlags GetFileEntryInfo(const FileEntryData& entry, FileEntryInfo& info,
                                             FileEntryInfoQueryFlags query) const override {
        return Strikes(entry) ? kFileEntryQueryNone : LocalBackEnd::GetFileEntryInfo(entry, info, query);
    }

private:
    // Whether a call fails; a transfer that falls short gets a smaller size.
    bool Strikes(const FileEntryData& entry, UInt64* size = nullptr) const {
        if (m_Kind.isShort && (size == nullptr || *size < 2)) return false;
        --m_CallsLeft;
        if (m_CallsLeft > 0 || (m_CallsLeft < 0 && !m_Kind.isLasting)) return false;
        if (action != nullptr) action();
        if (m_Kind.isShort) *size /= 2;
        if (action != nullptr || m_Kind.isShort) return false;
        entry.lastError = kFileSystemErrorUnknown;
        return true;
    }

    mutable int m_CallsLeft = 0; // until one fails; -1 and below: since then
    FaultKind m_Kind{false, false};
};
