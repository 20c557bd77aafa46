// A file system handler that forwards to another one and makes the n-th call that reaches the disk fail: once or from
// then on, wholly or by delivering only half; or has something happen to the world at that moment. A test raises n
// until a run meets no fault:
//
//   FaultyFileSystem faults;                       // serves every path as long as it lives
//   for (int n = 1; faults.Arm(n, kind), Run(), faults.HasStruck(); ++n) ...
#pragma once

#include "Runtime/VirtualFileSystem/VirtualFileSystem.h"

#include <functional>

struct FaultKind {
    bool isLasting; // every call from the n-th on fails
    bool isShort;   // reads and writes deliver half of what was asked, and succeed; other calls are left alone
};

class FaultyFileSystem : public FileSystemHandler {
public:
    FaultyFileSystem() : m_Real(*GetFileSystem()->GetHandlerForPath("")) { GetFileSystem()->RegisterHandler(this); }
    ~FaultyFileSystem() override { GetFileSystem()->UnregisterHandler(this); }

    // Makes the n-th call from now on fail.
    void Arm(int n, FaultKind kind) {
        m_CallsLeft = n;
        m_Kind = kind;
        m_HasStruck = false;
    }
    bool HasStruck() const { return m_HasStruck; }

    // Instead of failing, the call that is due runs this first, and goes on.
    std::function<void()> action;

    bool Open(FileEntryData& entry, FilePermission permission, FileAutoBehavior behavior) override {
        if (Strikes(&entry)) return false;
        const bool isOpen = m_Real.Open(entry, permission, behavior);
        InitializeFileEntry(entry); // the real handler has bound the entry to itself
        return isOpen;
    }
    bool Read(FileEntryData& entry, VFS::FileSize position, UInt64 size, void* buffer, UInt64* actual,
              FileReadFlags flags) override {
        return Seek(entry, VFS::FileOffset(position), kFileOriginBegin) && Read(entry, size, buffer, actual, flags);
    }
    bool Read(FileEntryData& entry, UInt64 size, void* buffer, UInt64* actual, FileReadFlags flags) override {
        return Transfers(entry, &size, actual) && m_Real.Read(entry, size, buffer, actual, flags);
    }
    bool Write(FileEntryData& entry, VFS::FileSize position, UInt64 size, const void* buffer,
               UInt64* written) override {
        return Seek(entry, VFS::FileOffset(position), kFileOriginBegin) && Write(entry, size, buffer, written);
    }
    bool Write(FileEntryData& entry, UInt64 size, const void* buffer, UInt64* written) override {
        return Transfers(entry, &size, written) && m_Real.Write(entry, size, buffer, written);
    }
    bool Close(FileEntryData& entry) override { return m_Real.Close(entry) && !Strikes(&entry); }
    bool Seek(FileEntryData& entry, VFS::FileOffset offset, FileOrigin origin) override {
        return !Strikes(&entry) && m_Real.Seek(entry, offset, origin);
    }
    VFS::FileSize Position(const FileEntryData& entry) const override { return m_Real.Position(entry); }
    bool SetLength(FileEntryData& entry, VFS::FileSize length) override { return m_Real.SetLength(entry, length); }
    VFS::FileSize Size(const FileEntryData& entry) const override { return m_Real.Size(entry); }

    bool CanHandle(core::string_ref) const override { return true; }
    core::string ToAbsolute(core::string_ref path) const override { return m_Real.ToAbsolute(path); }
    bool IsAbsoluteFilePath(core::string_ref path) const override { return m_Real.IsAbsoluteFilePath(path); }
    void InitializeFileEntry(FileEntryData& entry) override {
        entry.handler = this;
        entry.accessorHandler = this;
    }
    void DestroyFileEntry(FileEntryData&) override {}
    const char* Name() override { return "Faulty"; }
    bool Parent(const FileEntryData& entry, core::string& parent) const override {
        return m_Real.Parent(entry, parent);
    }
    const char* Filename(const FileEntryData& entry) const override { return m_Real.Filename(entry); }
    bool IsDir(const FileEntryData& entry) const override { return m_Real.IsDir(entry); }
    bool IsFile(const FileEntryData& entry) const override { return m_Real.IsFile(entry); }
    bool IsHidden(const FileEntryData& entry) const override { return m_Real.IsHidden(entry); }
    bool IsSymLink(const FileEntryData& entry) const override { return m_Real.IsSymLink(entry); }
    bool IsReadOnly(const FileEntryData& entry) const override { return m_Real.IsReadOnly(entry); }
    DateTime LastModified(const FileEntryData& entry) const override {
        return Strikes(&entry) ? DateTime{} : m_Real.LastModified(entry);
    }
    bool IsLocked(const FileEntryData& entry) override { return m_Real.IsLocked(entry); }
    bool SetFlags(FileEntryData& entry, UInt32 mask, UInt32 flags) override {
        return m_Real.SetFlags(entry, mask, flags);
    }
    bool CreateAsFile(FileEntryData& entry) override { return m_Real.CreateAsFile(entry); }
    bool CreateAsDir(FileEntryData& entry) override { return !Strikes(&entry) && m_Real.CreateAsDir(entry); }
    bool Delete(FileEntryData& entry, bool recursive) override { return m_Real.Delete(entry, recursive); }
    bool Target(const FileEntryData& entry, FileSystemEntry& target) const override {
        return m_Real.Target(entry, target);
    }
    bool Lock(FileEntryData& entry, FileLockMode mode) override { return m_Real.Lock(entry, mode); }
    bool SetReadOnly(FileEntryData& entry, bool readOnly) override { return m_Real.SetReadOnly(entry, readOnly); }
    bool Copy(FileEntryData& from, FileEntryData& to) override { return m_Real.Copy(from, to); }
    bool AtomicMove(FileEntryData& from, FileEntryData& to) override { return m_Real.AtomicMove(from, to); }
    bool MakeLocal(FileEntryData& entry, bool flag) override { return m_Real.MakeLocal(entry, flag); }
    bool ToLocal(const FileEntryData& entry, core::string& path, VFS::FileSize& offset,
                 VFS::FileSize& size) const override {
        return m_Real.ToLocal(entry, path, offset, size);
    }
    bool Enumerate(const char* path, dynamic_block_array<FileEntryInfo, 32>* out, bool recursive, void** handlerData,
                   FileEnumerationFlag flags) const override {
        return m_Real.Enumerate(path, out, recursive, handlerData, flags);
    }
    FileEntryInfoQueryFlags GetFileEntryInfo(const FileEntryData& entry, FileEntryInfo& info,
                                             FileEntryInfoQueryFlags query) const override {
        return Strikes(&entry) ? kFileEntryQueryNone : m_Real.GetFileEntryInfo(entry, info, query);
    }
    bool Touch(FileEntryData& entry) override { return m_Real.Touch(entry); }
    bool SetFileTimeStamp(FileEntryData& entry, const DateTime& time) override {
        return m_Real.SetFileTimeStamp(entry, time);
    }
    bool Exists(const FileEntryData& entry) const override { return m_Real.Exists(entry); }
    bool CanConvertToAbsolutePath(core::string_ref path) const override {
        return m_Real.CanConvertToAbsolutePath(path);
    }

private:
    bool IsDue() const {
        --m_CallsLeft;
        const bool isDue = m_CallsLeft == 0 || (m_CallsLeft < 0 && m_Kind.isLasting);
        m_HasStruck = m_HasStruck || isDue;
        if (!isDue || action == nullptr) return isDue;
        action();
        return false;
    }
    // A call that can only succeed or fail.
    bool Strikes(const FileEntryData* entry) const {
        if (m_Kind.isShort || !IsDue()) return false;
        entry->lastError = kFileSystemErrorUnknown;
        return true;
    }
    // A read or write: false when it fails, with a smaller size when it falls short.
    bool Transfers(const FileEntryData& entry, UInt64* size, UInt64* count) const {
        if (!m_Kind.isShort) {
            if (!Strikes(&entry)) return true;
            *count = 0;
            return false;
        }
        if (*size > 1 && IsDue()) *size /= 2;
        return true;
    }

    FileSystemHandler& m_Real;
    mutable int m_CallsLeft = 0;
    FaultKind m_Kind{false, false};
    mutable bool m_HasStruck = false;
};
