// What a mount shows of an archive: the files and folders that extraction would write, each with a number that depends
// on the archive alone. Build it, then any thread may use it.
//
//   MountTree tree(archive);
//   if (zarvo::error error = tree.Build()) return fail(error.text());
//   const std::optional<MountTree::Node> node = tree.Find(MountTree::kRoot, "road");
#pragma once

#include <zarvo.hpp>

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>

class MountTree {
public:
    static constexpr uint64_t kRoot = 1; // its number; entry 0 has kRoot + 1, and so on

    // The longest name that the kernel takes from a file system in a process. Longer ones are not shown.
    static constexpr size_t kMaxName = 1'024;

    struct Node {
        uint64_t number = 0;
        uint64_t entry = 0; // of a file
        bool isFolder = false;
        uint64_t size = 0;          // of a file: no more than the system can tell
        std::string_view name = {}; // valid as long as the archive is open
    };

    // archive outlives the tree.
    explicit MountTree(zarvo::archive& archive) : m_Archive(archive) {}

    [[nodiscard]] zarvo::error Build();

    // How many entries are not shown: extraction refuses them, or their names are too long.
    uint64_t CountHidden() const { return m_Hidden; }

    std::optional<Node> Get(uint64_t number) const;

    // A child by its name.
    std::optional<Node> Find(uint64_t folder, std::string_view name) const;

    std::optional<Node> GetParent(uint64_t number) const;

    // A folder's children, in the archive's order.
    std::optional<Node> GetFirstChild(uint64_t folder) const;
    std::optional<Node> GetNextSibling(uint64_t number) const;

private:
    static uint64_t ItemOf(uint64_t number) { return number == kRoot ? ZARVO_ROOT : number - kRoot - 1; }
    static uint64_t NumberOf(uint64_t item) { return item == ZARVO_ROOT ? kRoot : item + kRoot + 1; }

    std::string GetPath(uint64_t number) const;
    std::optional<Node> FindPath(std::string_view path) const;
    std::optional<Node> SkipHidden(uint64_t item) const;

    zarvo::archive& m_Archive;
    uint64_t m_Hidden = 0;

    // Items whose own entry is not shown, because it clashes with an earlier one: the entry that is shown instead, or
    // ZARVO_NO_ITEM for an implied folder.
    std::map<uint64_t, uint64_t> m_Replaced;
};
