// Prints the path of every entry, folders with a "/" at their end: ListEntries ARCHIVE
#include <zarvo.hpp>

#include <iostream>

int main(int argumentCount, char** arguments) {
    if (argumentCount != 2) {
        std::cerr << "Usage: ListEntries ARCHIVE\n";
        return 2;
    }
    const auto archive = zarvo::archive::open(arguments[1]);
    if (!archive) {
        std::cerr << arguments[1] << ": " << archive.error().text() << "\n";
        return 1;
    }
    for (const zarvo::entry entry : archive->entries())
        std::cout << entry.path() << (entry.is_folder() ? "/" : "") << "\n";
    return std::cout.flush() ? 0 : 1;
}
