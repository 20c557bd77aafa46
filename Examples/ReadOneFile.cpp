// Writes one file of an archive to standard output: ReadOneFile ARCHIVE PATH
#include <zarvo.hpp>

#include <iostream>
#include <vector>

namespace {

int Fail(const char* name, std::string_view why) {
    std::cerr << name << ": " << why << "\n";
    return 1;
}

} // namespace

int main(int argumentCount, char** arguments) {
    if (argumentCount != 3) {
        std::cerr << "Usage: ReadOneFile ARCHIVE PATH\n";
        return 2;
    }
    auto archive = zarvo::archive::open(arguments[1]);
    if (!archive) return Fail(arguments[1], archive.error().text());
    const auto index = archive->find(arguments[2]);
    if (!index) return Fail(arguments[2], index.error().text());
    const auto item = archive->item(*index);
    if (!item) return Fail(arguments[2], item.error().text());
    if (item->kind == ZARVO_FOLDER) return Fail(arguments[2], "a folder");
    auto stream = archive->open_stream(*index);
    if (!stream) return Fail(arguments[2], stream.error().text());

    std::vector<char> piece(65'536);
    for (;;) {
        const zarvo::read_result read = stream->read(std::as_writable_bytes(std::span(piece)));
        std::cout.write(piece.data(), static_cast<std::streamsize>(read.count)); // what lies before damage, too
        if (read.error) return Fail(arguments[2], read.error.text());
        if (read.count == 0) break;
    }
    return std::cout.flush() ? 0 : 1;
}
