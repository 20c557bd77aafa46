#include "Tools/Zarvo/MountedArchive.h"

#include "Tools/Zarvo/Text.h"

#include <cerrno>
#include <cstring>
#include <sys/statvfs.h>
#include <syslog.h>
#include <unistd.h>
#include <utility>

namespace {

constexpr double kForEver = 1e9; // seconds
constexpr blksize_t kPageSize = 4'096;

// Lets an archive answer a request. Exceptions must not reach libfuse, which is C.
template <typename... Parameters, typename... Arguments>
void Answer(fuse_req_t request, void (MountedArchive::*answer)(fuse_req_t, Parameters...), Arguments... arguments) {
    try {
        (static_cast<MountedArchive*>(fuse_req_userdata(request))->*answer)(request, arguments...);
    } catch (const std::bad_alloc&) {
        fuse_reply_err(request, ENOMEM);
    }
}

} // namespace

const fuse_lowlevel_ops MountedArchive::kOperations = [] {
    fuse_lowlevel_ops operations = {};
    operations.init = [](void* context, fuse_conn_info* connection) {
        static_cast<MountedArchive*>(context)->Begin(connection);
    };
    operations.lookup = [](fuse_req_t request, fuse_ino_t folder, const char* name) {
        Answer(request, &MountedArchive::Lookup, folder, name);
    };
    operations.getattr = [](fuse_req_t request, fuse_ino_t number, fuse_file_info*) {
        Answer(request, &MountedArchive::GetAttributes, number);
    };
    operations.readdir = [](fuse_req_t request, fuse_ino_t number, size_t size, off_t position, fuse_file_info*) {
        Answer(request, &MountedArchive::ReadFolder, number, size, static_cast<uint64_t>(position), false);
    };
    operations.readdirplus = [](fuse_req_t request, fuse_ino_t number, size_t size, off_t position, fuse_file_info*) {
        Answer(request, &MountedArchive::ReadFolder, number, size, static_cast<uint64_t>(position), true);
    };
    operations.read = [](fuse_req_t request, fuse_ino_t number, size_t size, off_t offset, fuse_file_info*) {
        Answer(request, &MountedArchive::Read, number, size, static_cast<uint64_t>(offset));
    };
    operations.statfs = [](fuse_req_t request, fuse_ino_t) { Answer(request, &MountedArchive::GetStatistics); };
    // Files have no state while they are open. A kernel that hears so never asks again; an older one opens each.
    operations.open = [](fuse_req_t request, fuse_ino_t, fuse_file_info* file) {
        file->keep_cache = 1;
        Answer(request, &MountedArchive::OpenFile, file, unsigned{FUSE_CAP_NO_OPEN_SUPPORT});
    };
    operations.opendir = [](fuse_req_t request, fuse_ino_t, fuse_file_info* file) {
        file->keep_cache = file->cache_readdir = 1;
        Answer(request, &MountedArchive::OpenFile, file, unsigned{FUSE_CAP_NO_OPENDIR_SUPPORT});
    };
    return operations;
}();

void MountedArchive::Begin(fuse_conn_info* connection) {
    m_Capabilities = connection->capable;
    connection->want &= ~static_cast<unsigned>(FUSE_CAP_AUTO_INVAL_DATA); // what is cached stays valid
    connection->max_read = kMaxRead;
    if (m_Ready) m_Ready();
}

void MountedArchive::OpenFile(fuse_req_t request, fuse_file_info* file, unsigned needless) {
    if ((m_Capabilities & needless) != 0)
        fuse_reply_err(request, ENOSYS);
    else
        fuse_reply_open(request, file);
}

bool MountedArchive::Open(unsigned* threads) {
    const uint64_t maxBlockBytes = m_Run.GetMaxBlockBytes();
    m_Archive = m_Run.OpenArchive(m_Path, maxBlockBytes, [this](std::string_view text) { Say(m_Path, text); });
    if (!m_Archive) return false;
    if (stat(m_Path.c_str(), &m_File) != 0) {
        Say(m_Path, strerror(errno));
        return false;
    }
    m_Tree.emplace(*m_Archive);
    if (const zarvo::error error = m_Tree->Build()) {
        Say(m_Path, error.text());
        return false;
    }
    if (const uint64_t hidden = m_Tree->CountHidden(); hidden != 0)
        Say(m_Path, MakeMessage("% entries can't be shown", {std::to_string(hidden)}));
    *threads = static_cast<unsigned>(MountReader::FitThreads(*m_Archive, *threads, maxBlockBytes));
    m_Reader.emplace(*m_Archive, *threads, maxBlockBytes);
    return true;
}

void MountedArchive::Say(const std::string& name, std::string_view text) {
    const std::lock_guard lock(m_Lock);
    if (m_IsInBackground)
        syslog(LOG_USER | LOG_WARNING, "%s", EscapeControls(name + ": " + std::string(text)).c_str());
    else
        m_Run.console.Say(name, text);
}

struct stat MountedArchive::Describe(const MountTree::Node& node) const {
    struct stat attributes = {};
    attributes.st_ino = node.number;
    attributes.st_mode = node.isFolder ? S_IFDIR | 0555 : S_IFREG | 0444;
    attributes.st_nlink = 1; // of a folder: its subfolders are not counted
    attributes.st_uid = getuid();
    attributes.st_gid = getgid();
    attributes.st_size = static_cast<off_t>(node.size);
    attributes.st_blksize = kPageSize;
    attributes.st_blocks = static_cast<blkcnt_t>((node.size + 511) / 512);
    attributes.st_atim = attributes.st_mtim = attributes.st_ctim = m_File.st_mtim;
    return attributes;
}

fuse_entry_param MountedArchive::MakeEntry(const MountTree::Node& node) const {
    fuse_entry_param entry = {};
    entry.ino = node.number;
    entry.attr = Describe(node);
    entry.attr_timeout = kForEver;
    entry.entry_timeout = kForEver;
    return entry;
}

void MountedArchive::Lookup(fuse_req_t request, uint64_t folder, const char* name) {
    const std::optional<MountTree::Node> node = m_Tree->Find(folder, name);
    // Number 0 is an answer, too, which the kernel keeps: there is no such file.
    fuse_entry_param none = {};
    none.entry_timeout = kForEver;
    const fuse_entry_param entry = node ? MakeEntry(*node) : none;
    fuse_reply_entry(request, &entry);
}

void MountedArchive::GetAttributes(fuse_req_t request, uint64_t number) {
    const std::optional<MountTree::Node> node = m_Tree->Get(number);
    if (!node) {
        fuse_reply_err(request, ENOENT);
        return;
    }
    const struct stat attributes = Describe(*node);
    fuse_reply_attr(request, &attributes, kForEver);
}

// The position after an item is its number and 2; before it come the folder itself and the one above it.
void MountedArchive::ReadFolder(fuse_req_t request, uint64_t number, size_t size, uint64_t position,
                                bool withAttributes) {
    std::vector<char> buffer(size);
    size_t used = 0;
    const auto add = [&](const char* name, const MountTree::Node& node, uint64_t next) {
        fuse_entry_param entry = MakeEntry(node);
        if (next <= 2) entry.ino = 0; // the kernel has them already
        char* const place = buffer.data() + used;
        const size_t taken =
            withAttributes
                ? fuse_add_direntry_plus(request, place, size - used, name, &entry, static_cast<off_t>(next))
                : fuse_add_direntry(request, place, size - used, name, &entry.attr, static_cast<off_t>(next));
        if (taken > size - used) return false;
        used += taken;
        return true;
    };
    const std::optional<MountTree::Node> own = m_Tree->Get(number);
    const std::optional<MountTree::Node> parent = m_Tree->GetParent(number);
    if (!own || !parent) {
        fuse_reply_err(request, ENOENT);
        return;
    }
    // A program may seek to a position of another folder. The kernel would believe that what comes next is in this one.
    if (position > 2) {
        const std::optional<MountTree::Node> folder = m_Tree->GetParent(position - 2);
        if (!folder || folder->number != number) {
            fuse_reply_buf(request, nullptr, 0);
            return;
        }
    }
    bool hasRoom = true;
    if (position < 1) hasRoom = add(".", *own, 1);
    if (position < 2 && hasRoom) hasRoom = add("..", *parent, 2);
    std::optional<MountTree::Node> child =
        position <= 2 ? m_Tree->GetFirstChild(number) : m_Tree->GetNextSibling(position - 2);
    for (; child && hasRoom; child = m_Tree->GetNextSibling(child->number))
        hasRoom = add(std::string(child->name).c_str(), *child, child->number + 2);
    fuse_reply_buf(request, buffer.data(), used);
}

void MountedArchive::Read(fuse_req_t request, uint64_t number, size_t size, uint64_t offset) {
    const std::optional<MountTree::Node> node = m_Tree->Get(number);
    if (!node || node->isFolder) {
        fuse_reply_err(request, node ? EISDIR : ENOENT);
        return;
    }
    thread_local std::vector<std::byte> buffer;
    size = offset < node->size ? std::min<uint64_t>(size, node->size - offset) : 0;
    if (buffer.size() < size) buffer.resize(size);
    const zarvo::entry entry = m_Archive->entries()[node->entry];
    const zarvo::read_result read = m_Reader->Read(entry, offset, std::span(buffer).first(size));
    // To the kernel, fewer bytes would be the end of the file. After an error it asks again, for each page that is
    // wanted, and so gets those that can be read.
    if (read.count < size) {
        SayOfRead(node->entry, read.error);
        fuse_reply_err(request, read.error.code() == ZARVO_ERROR_MEMORY ? ENOMEM : EIO);
        return;
    }
    fuse_reply_buf(request, reinterpret_cast<const char*>(buffer.data()), size);
}

void MountedArchive::SayOfRead(uint64_t entry, const zarvo::error& error) {
    {
        const std::lock_guard lock(m_Lock);
        if (error.code() == ZARVO_ERROR_CHANGED ? std::exchange(m_HasSaidChanged, true) : !m_Said.insert(entry).second)
            return;
    }
    if (error.code() == ZARVO_ERROR_CHANGED)
        Say(m_Path, error.text());
    else
        Say(m_Path + ": " + std::string(m_Archive->entries()[entry].path()), error.text());
}

void MountedArchive::GetStatistics(fuse_req_t request) {
    const zarvo_info info = m_Archive->info();
    struct statvfs statistics = {};
    statistics.f_bsize = statistics.f_frsize = kPageSize;
    statistics.f_blocks = (info.data_size + kPageSize - 1) / kPageSize;
    statistics.f_files = m_Archive->item_count();
    statistics.f_namemax = MountTree::kMaxName;
    fuse_reply_statfs(request, &statistics);
}
