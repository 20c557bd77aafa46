// An archive as libfuse asks for it. Nothing in it changes, so the kernel keeps for ever what it is told, and each file
// has its number from the archive, not from what has been asked so far. Any thread, once it is open.
#pragma once

#include "Tools/Zarvo/MountReader.h"
#include "Tools/Zarvo/MountSession.h"
#include "Tools/Zarvo/MountTree.h"
#include "Tools/Zarvo/Run.h"

#include <functional>
#include <optional>
#include <set>
#include <sys/stat.h>

class MountedArchive {
public:
    MountedArchive(const Run& run, std::string path) : m_Run(run), m_Path(std::move(path)) {}

    // How many bytes a request asks for at most, which is an option of the mount, too. As many as the kernel reads
    // ahead: several threads then share a large read, and their buffers stay small.
    static constexpr unsigned kMaxRead = 131'072;

    // False, and a message, when the archive can't be opened. *threads: how many may ask; afterwards how
    // many the budget of memory allows.
    [[nodiscard]] bool Open(unsigned* threads);

    // Their context is this object.
    static const fuse_lowlevel_ops kOperations;

    // Is called when the kernel asks for the first time.
    void SetReady(std::function<void()> ready) { m_Ready = std::move(ready); }

    // From now on, messages go to the system's log. Called while there is one thread.
    void GoToBackground() { m_IsInBackground = true; }

    // A message, on any thread.
    void Say(const std::string& name, std::string_view text);

private:
    void Begin(fuse_conn_info* connection);
    void Lookup(fuse_req_t request, uint64_t folder, const char* name);
    void GetAttributes(fuse_req_t request, uint64_t number);
    void ReadFolder(fuse_req_t request, uint64_t number, size_t size, uint64_t position, bool withAttributes);
    void OpenFile(fuse_req_t request, fuse_file_info* file, unsigned needless);
    void Read(fuse_req_t request, uint64_t number, size_t size, uint64_t offset);
    void GetStatistics(fuse_req_t request);

    struct stat Describe(const MountTree::Node& node) const;
    fuse_entry_param MakeEntry(const MountTree::Node& node) const;
    void SayOfRead(uint64_t entry, const zarvo::error& error);

    const Run& m_Run;
    const std::string m_Path;
    std::optional<zarvo::archive> m_Archive;
    std::optional<MountTree> m_Tree;
    std::optional<MountReader> m_Reader;
    struct stat m_File = {}; // the archive's
    std::function<void()> m_Ready;
    unsigned m_Capabilities = 0; // the kernel's

    bool m_IsInBackground = false;
    std::mutex m_Lock;         // of the messages
    std::set<uint64_t> m_Said; // the entries of which it was said why they can't be read
    bool m_HasSaidChanged = false;
};
