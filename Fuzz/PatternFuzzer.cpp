// Property: patterns match what a slow, recursive matcher matches, which knows them only as zarvo.h describes them; and
// those count as used that match alone. Texts are made of few different characters, so that they meet.
#include "Fuzz/FuzzSupport.h"
#include "Library/include/zarvo.h"

#include <algorithm>
#include <string>

namespace {

// As UTF-32; a byte that is no UTF-8 is kBroken.
using Text = std::u32string;
constexpr char32_t kUmlaut = 0xE4;
constexpr char32_t kBroken = 0x1100FF;

std::string Encode(const Text& text) {
    std::string bytes;
    for (char32_t character : text) {
        if (character == kUmlaut)
            bytes += "\xC3\xA4";
        else
            bytes += character == kBroken ? '\xFF' : static_cast<char>(character);
    }
    return bytes;
}

Text Draw(FuzzInput& input, const Text& alphabet, UInt64 maxLength) {
    Text text(static_cast<size_t>(input.TakeByteBelow(maxLength + 1)), U'?');
    for (char32_t& character : text)
        character = alphabet[static_cast<size_t>(input.TakeByteBelow(alphabet.size()))];
    return text;
}

bool IsSeparator(char32_t character) { return character == U'/' || character == U'\\'; }

Text Normalize(const Text& path) {
    Text normal;
    Text component;
    for (size_t at = 0; at <= path.size(); ++at) {
        if (at != path.size() && !IsSeparator(path[at])) {
            component += path[at];
            continue;
        }
        if (!component.empty() && component != U".") normal += (normal.empty() ? U"" : U"/") + component;
        component.clear();
    }
    return normal;
}

Text StripEnds(Text text) {
    while (text.starts_with(U"/") || text.starts_with(U"./"))
        text.erase(0, text[0] == U'.' ? 2 : 1);
    while (text.ends_with(U"/"))
        text.pop_back();
    return text;
}

// The set that a "[" starts: its length, or 0 when it has no end, and whether the character is in it.
size_t ReadSet(const Text& glob, char32_t character, bool* isMember) {
    size_t at = 1;
    const bool isNegated = glob.size() > 1 && (glob[1] == U'!' || glob[1] == U'^');
    if (isNegated) ++at;
    const size_t first = at;
    auto member = [&] {
        if (glob[at] == U'\\' && at + 1 < glob.size()) ++at;
        return glob[at++];
    };
    bool isListed = false;
    while (at < glob.size() && (glob[at] != U']' || at == first)) {
        const char32_t low = member();
        const bool isRange = at + 1 < glob.size() && glob[at] == U'-' && glob[at + 1] != U']';
        if (isRange) ++at;
        const char32_t high = isRange ? member() : low;
        isListed = isListed || (low <= character && character <= high);
    }
    *isMember = isListed != isNegated;
    return at < glob.size() ? at + 1 : 0;
}

bool MatchGlob(const Text& glob, const Text& text, bool isAtComponent) {
    if (glob.empty()) return text.empty();
    if (glob[0] == U'*') {
        const size_t stars = std::min(glob.find_first_not_of(U'*'), glob.size());
        Text rest = glob.substr(stars);
        const bool takesFolders = stars > 1 && isAtComponent && rest.starts_with(U"/");
        if (takesFolders) rest.erase(0, 1);
        for (size_t taken = 0; taken <= text.size(); ++taken) {
            if (taken != 0 && stars == 1 && text[taken - 1] == U'/') return false;
            if (takesFolders && taken != 0 && text[taken - 1] != U'/') continue;
            if (MatchGlob(rest, text.substr(taken), takesFolders)) return true;
        }
        return false;
    }
    if (text.empty()) return false;
    size_t length = 1;
    bool isTaken = false;
    bool isMember = false;
    const size_t setLength = glob[0] == U'[' ? ReadSet(glob, text[0], &isMember) : 0;
    if (glob[0] == U'?') {
        isTaken = text[0] != U'/';
    } else if (setLength != 0) {
        length = setLength;
        isTaken = isMember && text[0] != U'/';
    } else {
        if (glob[0] == U'\\' && glob.size() > 1) length = 2;
        isTaken = glob[length - 1] == text[0];
    }
    return isTaken && MatchGlob(glob.substr(length), text.substr(1), glob[length - 1] == U'/');
}

// Whether a text, or a folder that it lies in, is accepted.
template <typename Accept>
bool AnyFolder(const Text& text, Accept&& accept) {
    for (size_t end = 1; end < text.size(); ++end)
        if (IsSeparator(text[end]) && accept(text.substr(0, end))) return true;
    return accept(text);
}

bool Matches(const Text& pattern, const Text& path) {
    const Text glob = StripEnds(pattern);
    const Text literal = Normalize(glob);
    const Text normal = Normalize(path);
    auto isLiteral = [&](const Text& folder) { return folder == literal; };
    auto isTaken = [&](const Text& folder) { return MatchGlob(glob, folder, true); };
    return literal.empty() || AnyFolder(normal, isLiteral) || AnyFolder(normal, isTaken) ||
           AnyFolder(StripEnds(path), isTaken);
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, size_t size) {
    FuzzInput input(data, size);
    Text patterns[2];
    for (Text& pattern : patterns)
        pattern = Draw(input,
                       {U'a', U'b', U'/', U'*', U'*', U'?', U'[', U']', U'!', U'-', U'\\', U'.', kUmlaut, kBroken}, 12);
    const Text path = Draw(input, {U'a', U'b', U'/', U'a', U'*', U'[', U'-', U'\\', U'.', kUmlaut, kBroken}, 14);

    zarvo_patterns* made = nullptr;
    FuzzCheck(zarvo_patterns_new(&made, nullptr) == ZARVO_OK);
    for (const Text& pattern : patterns) {
        const std::string bytes = Encode(pattern);
        FuzzCheck(zarvo_patterns_add(made, bytes.data(), bytes.size(), nullptr) == ZARVO_OK);
    }
    const std::string bytes = Encode(path);
    const bool expected[] = {Matches(patterns[0], path), Matches(patterns[1], path)};
    FuzzCheck(zarvo_patterns_match(made, bytes.data(), bytes.size()) == (expected[0] || expected[1] ? 1 : 0));
    for (size_t index = 0; index < 2; ++index)
        FuzzCheck(zarvo_patterns_used(made, index) == (expected[index] ? 1 : 0));
    zarvo_patterns_free(made);
    return 0;
}
