#include "Tools/Zarvo/Text.h"

#include <algorithm>
#include <cstdint>
#include <cstdio>
#include <iterator>

namespace {

// How many bytes the character at the front of a text that isn't empty has, or 0 where it is broken: a byte that begins
// none, a character cut short, one longer than it needs to be, a surrogate, or one past U+10FFFF.
//
// first byte  bytes  second byte
// 00-7F       1
// C2-DF       2      80-BF
// E0          3      A0-BF (shorter ones are overlong)
// E1-EF       3      80-BF, of ED 80-9F (the rest are surrogates)
// F0          4      90-BF (shorter ones are overlong)
// F1-F4       4      80-BF, of F4 80-8F (the rest is past U+10FFFF)
size_t MeasureCharacter(std::string_view text) {
    const auto byte = [&](size_t index) { return static_cast<uint8_t>(text[index]); };
    const uint8_t first = byte(0);
    if (first < 0x80) return 1;
    if (first < 0xC2 || first > 0xF4) return 0;
    const size_t size = first < 0xE0 ? 2 : first < 0xF0 ? 3 : 4;
    if (text.size() < size) return 0;
    const uint8_t least = first == 0xE0 ? 0xA0 : first == 0xF0 ? 0x90 : 0x80;
    const uint8_t most = first == 0xED ? 0x9F : first == 0xF4 ? 0x8F : 0xBF;
    if (byte(1) < least || byte(1) > most) return 0;
    for (size_t index = 2; index < size; ++index)
        if (byte(index) < 0x80 || byte(index) > 0xBF) return 0;
    return size;
}

bool IsControl(std::string_view character) {
    const auto first = static_cast<uint8_t>(character[0]);
    return first < 0x20 || first == 0x7F || (first == 0xC2 && static_cast<uint8_t>(character[1]) < 0xA0);
}

// Calls take with each character, and spoil with each byte that is part of none.
template <typename Take, typename Spoil>
void ForEachCharacter(std::string_view text, Take&& take, Spoil&& spoil) {
    while (!text.empty()) {
        const size_t size = MeasureCharacter(text);
        if (size == 0)
            spoil(text[0]);
        else
            take(text.substr(0, size));
        text.remove_prefix(std::max<size_t>(size, 1));
    }
}

bool IsPlain(std::string_view text) {
    return std::ranges::all_of(text, [](char byte) { return byte >= 0x20 && byte < 0x7F; });
}

std::string FormatByte(const char* format, char byte) {
    char text[8];
    (void)snprintf(text, sizeof(text), format, static_cast<unsigned>(static_cast<uint8_t>(byte)));
    return text;
}

} // namespace

std::string EscapeControls(std::string_view text) {
    if (IsPlain(text)) return std::string(text);
    std::string escaped;
    const auto escape = [&](char byte) {
        switch (byte) {
        case '\n': escaped += "\\n"; break;
        case '\r': escaped += "\\r"; break;
        case '\t': escaped += "\\t"; break;
        default: escaped += FormatByte("\\x%02x", byte);
        }
    };
    const auto take = [&](std::string_view character) {
        if (IsControl(character))
            std::ranges::for_each(character, escape);
        else
            escaped += character;
    };
    ForEachCharacter(text, take, escape);
    return escaped;
}

std::string EscapeControlsInJson(std::string_view json) {
    if (IsPlain(json)) return std::string(json);
    std::string escaped;
    const auto take = [&](std::string_view character) {
        if (IsControl(character))
            escaped += FormatByte("\\u00%02x", character.back());
        else
            escaped += character;
    };
    ForEachCharacter(json, take, [&](char byte) { escaped += byte; });
    return escaped;
}

bool IsUtf8(std::string_view text) {
    bool isUtf8 = true;
    ForEachCharacter(
        text, [](std::string_view) {}, [&](char) { isUtf8 = false; });
    return isUtf8;
}

std::string_view FirstCharacter(std::string_view text) {
    return text.substr(0, std::max<size_t>(MeasureCharacter(text), 1));
}

std::string ReplaceBrokenUtf8(std::string_view text) {
    std::string replaced;
    ForEachCharacter(
        text, [&](std::string_view character) { replaced += character; }, [&](char) { replaced += "\xEF\xBF\xBD"; });
    return replaced;
}

std::string EncodeBase64(std::string_view bytes) {
    constexpr char kDigits[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    std::string encoded;
    for (size_t index = 0; index < bytes.size(); index += 3) {
        uint32_t group = 0; // three bytes are four digits; what is missing at the end is zeros, and "=" in the text
        const size_t count = std::min<size_t>(3, bytes.size() - index);
        for (size_t place = 0; place < 3; ++place)
            group = group << 8 | (place < count ? static_cast<uint8_t>(bytes[index + place]) : 0u);
        for (size_t digit = 0; digit < 4; ++digit)
            encoded += digit > count ? '=' : kDigits[group >> (18 - 6 * digit) & 63];
    }
    return encoded;
}

std::string MakeMessage(std::string_view form, std::initializer_list<std::string_view> parts) {
    std::string text;
    const std::string_view* part = parts.begin();
    for (const char character : form) {
        if (character == '%' && part != parts.end())
            text += *part++;
        else
            text += character;
    }
    return text;
}

std::string QuoteEmpty(std::string_view name) { return name.empty() ? "''" : std::string(name); }

std::string FormatSeconds(std::chrono::duration<double> time) {
    char text[32];
    (void)snprintf(text, sizeof(text), "%.2f", time.count());
    return text;
}

std::string DescribeBytes(double bytes) {
    constexpr const char* kUnits[] = {"bytes", "KiB", "MiB", "GiB", "TiB", "PiB", "EiB"};
    size_t unit = 0;
    for (; bytes >= 1'000 && unit + 1 < std::size(kUnits); ++unit)
        bytes /= 1'024;
    char text[32];
    (void)snprintf(text, sizeof(text), unit == 0 ? "%.0f %s" : "%.1f %s", bytes, kUnits[unit]);
    return text;
}
