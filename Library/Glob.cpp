#include "Library/Glob.h"

#include "Library/PathRules.h"

namespace {

constexpr UInt32 kBrokenByte = 0x110000; // added to bytes that are no UTF-8: after the last code point

// The character at a position of a text that has not ended, and its length.
UInt32 CharacterAt(core::string_ref text, size_t position, size_t* length) {
    auto byteAt = [&](size_t index) { return static_cast<UInt8>(text[index]); };
    const UInt8 first = byteAt(position);
    *length = 1;
    if (first < 0x80) return first;
    size_t count = 0;
    UInt32 least = 0;
    if (first >= 0xC2 && first < 0xE0) count = 2, least = 0x80;
    if (first >= 0xE0 && first < 0xF0) count = 3, least = 0x800;
    if (first >= 0xF0 && first < 0xF5) count = 4, least = 0x10000;
    if (count == 0 || text.size() - position < count) return kBrokenByte + first;
    UInt32 character = first & (0xFFu >> (count + 1));
    for (size_t index = 1; index < count; ++index) {
        const UInt8 next = byteAt(position + index);
        if ((next & 0xC0) != 0x80) return kBrokenByte + first;
        character = character << 6 | (next & 0x3F);
    }
    const bool isSurrogate = character >= 0xD800 && character < 0xE000;
    if (character < least || character > 0x10FFFF || isSurrogate) return kBrokenByte + first;
    *length = count;
    return character;
}

// Reads one member of a set, or one end of a range: "\" takes the next character as it is.
UInt32 SetMemberAt(core::string_ref glob, size_t* position) {
    if (glob[*position] == '\\' && *position + 1 < glob.size()) ++*position;
    size_t length;
    const UInt32 character = CharacterAt(glob, *position, &length);
    *position += length;
    return character;
}

// The set that starts at a "[". False when it has no end; else *end is just past its "]".
bool MatchSet(core::string_ref glob, size_t start, UInt32 character, size_t* end, bool* isMember) {
    size_t at = start + 1;
    const bool isNegated = at < glob.size() && (glob[at] == '!' || glob[at] == '^');
    if (isNegated) ++at;
    bool isFound = false;
    for (bool isFirst = true; at < glob.size(); isFirst = false) {
        if (glob[at] == ']' && !isFirst) {
            *end = at + 1;
            *isMember = isFound != isNegated;
            return true;
        }
        const UInt32 low = SetMemberAt(glob, &at);
        UInt32 high = low;
        if (at + 1 < glob.size() && glob[at] == '-' && glob[at + 1] != ']') {
            ++at;
            high = SetMemberAt(glob, &at);
        }
        isFound = isFound || (low <= character && character <= high);
    }
    return false;
}

// Takes one character of the text with what stands at a position of the glob, and moves both.
bool MatchOne(core::string_ref glob, size_t* globAt, core::string_ref text, size_t* textAt) {
    if (*globAt == glob.size() || *textAt == text.size()) return false;
    size_t length;
    const UInt32 character = CharacterAt(text, *textAt, &length);
    size_t next = *globAt;
    bool isTaken = false;
    size_t literalLength = 0;
    if (glob[next] == '?') {
        ++next;
        isTaken = character != '/';
    } else if (glob[next] == '[' && MatchSet(glob, next, character, &next, &isTaken)) {
        isTaken = isTaken && character != '/';
    } else {
        if (glob[next] == '\\' && next + 1 < glob.size()) ++next;
        isTaken = CharacterAt(glob, next, &literalLength) == character;
        next += literalLength;
    }
    if (!isTaken) return false;
    *globAt = next;
    *textAt += length;
    return true;
}

// Where matching goes on when what follows a star does not fit: the star takes one character more.
struct Star {
    bool isThere = false;
    bool takesFolders = false; // "**/": it takes whole components
    size_t globAt = 0;         // just past the star
    size_t textAt = 0;         // where what follows was tried last
};

} // namespace

bool MatchGlobOrFolder(core::string_ref glob, core::string_ref text) {
    size_t globAt = 0;
    size_t textAt = 0;
    // A later star of either kind makes earlier ones of that kind not worth another try: what it could take in
    // addition, the later one takes as well. After a "**" that holds for both kinds.
    Star star;     // "*"
    Star deepStar; // "**"
    while (true) {
        const bool isAtEnd = textAt == text.size() || (textAt != 0 && IsSeparator(text[textAt]));
        if (globAt == glob.size() && isAtEnd) return true;
        if (globAt < glob.size() && glob[globAt] == '*') {
            const bool isAtComponent = globAt == 0 || glob[globAt - 1] == '/';
            size_t end = globAt;
            while (end < glob.size() && glob[end] == '*')
                ++end;
            const bool isDeep = end - globAt >= 2;
            const bool takesFolders = isDeep && isAtComponent && end < glob.size() && glob[end] == '/';
            globAt = end + (takesFolders ? 1 : 0);
            (isDeep ? deepStar : star) = {true, takesFolders, globAt, textAt};
            if (isDeep) star = {};
            continue;
        }
        if (MatchOne(glob, &globAt, text, &textAt)) continue;
        if (star.isThere && star.textAt < text.size() && text[star.textAt] != '/') {
            size_t length;
            (void)CharacterAt(text, star.textAt, &length);
            star.textAt += length;
            globAt = star.globAt;
            textAt = star.textAt;
            continue;
        }
        if (!deepStar.isThere || deepStar.textAt == text.size()) return false;
        star = {};
        size_t length = 1;
        if (deepStar.takesFolders)
            length = std::min(text.find('/', deepStar.textAt), text.size() - 1) + 1 - deepStar.textAt;
        else
            (void)CharacterAt(text, deepStar.textAt, &length);
        deepStar.textAt += length;
        globAt = deepStar.globAt;
        textAt = deepStar.textAt;
    }
}

bool IsGlob(core::string_ref text) {
    for (char character : text)
        if (character == '*' || character == '?' || character == '[' || character == '\\') return true;
    return false;
}
