// What mounts show, without a mount.
#include "Tools/Zarvo/MountTree.h"

#include "Tests/Support/FolderTree.h"
#include "Tests/Tools/Zarvo/ZarvoTest.h"
#include <zarvo.hpp>

namespace {

// Adds what a folder shows. path: of the folder.
void AddShown(zarvo::archive& archive, const MountTree& tree, uint64_t folder, const std::string& path,
              FolderTree* shown) {
    std::optional<MountTree::Node> node = tree.GetFirstChild(folder);
    if (!node && !path.empty()) (*shown)[path] = kFolder;
    for (; node; node = tree.GetNextSibling(node->number)) {
        const std::string at = path + (path.empty() ? "" : "/") + std::string(node->name);
        EXPECT_EQ(node->number, tree.Find(folder, node->name).value_or(MountTree::Node()).number) << at;
        EXPECT_EQ(folder, tree.GetParent(node->number).value_or(MountTree::Node()).number) << at;
        if (node->isFolder) {
            AddShown(archive, tree, node->number, at, shown);
            continue;
        }
        std::string bytes(node->size, '\0');
        EXPECT_EQ("", archive.read(node->entry, 0, std::as_writable_bytes(std::span(bytes))).error.text()) << at;
        EXPECT_EQ(true, shown->emplace(at, bytes).second) << at << " is shown twice";
    }
}

std::string RandomPath(std::mt19937& random) {
    constexpr const char* kNames[] = {"a", "a", "a", "a", "b", "b", "b", "c", "c", "", ".", ".."};
    std::string path;
    for (size_t left = 1 + random() % 4; left != 0; --left) {
        path += kNames[random() % std::size(kNames)];
        if (left != 1) path += random() % 3 == 0 ? '\\' : '/';
    }
    return path;
}

class ZarvoMountTree : public ZarvoTest {};

// Files where folders have to be, names that are listed twice, and paths that extraction refuses.
TEST_F(ZarvoMountTree, ShowsWhatExtractionWrites) {
    for (unsigned seed = 1; seed <= 500 && !HasFailure(); ++seed) {
        std::mt19937 random(seed);
        ArchiveDescription description;
        std::string paths;
        for (size_t left = 2 + random() % 8; left != 0; --left) {
            const bool isFolder = random() % 3 == 0;
            const std::string path = RandomPath(random);
            const std::string bytes = isFolder ? "" : std::to_string(left);
            description.entries.push_back({.path = path, .bytes = bytes, .flags = isFolder ? kFolderEntry : 0});
            paths += path + (isFolder ? " (folder)\n" : "\n");
        }
        SCOPED_TRACE("seed " + std::to_string(seed) + "\n" + paths);
        MakeArchive("a.zarvo", description);
        zarvo::archive archive = *zarvo::archive::open("a.zarvo");
        uint64_t refused = 0;
        zarvo::extract_options how;
        how.report = [&](const zarvo_report& report) { refused += report.code == ZARVO_ERROR_REFUSED ? 1 : 0; };
        EXPECT_EQ("", archive.extract("out", {}, how).error.text());

        MountTree tree(archive);
        EXPECT_EQ("", tree.Build().text());
        FolderTree shown;
        AddShown(archive, tree, MountTree::kRoot, "", &shown);
        EXPECT_EQ(ReadFolderTree("out"), shown);
        EXPECT_EQ(refused, tree.CountHidden());
        fs::remove_all("out");
    }
}

} // namespace
