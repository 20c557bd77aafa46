// Texts that come from archives and the command line, made fit for terminals, messages and JSON.
#pragma once

#include <chrono>
#include <initializer_list>
#include <string>
#include <string_view>

// Control characters (also U+0080 to U+009F) and the bytes of broken UTF-8 as "\n", "\t", "\r" or "\x1b"; the rest as
// it is, a backslash, too.
std::string EscapeControls(std::string_view text);

// The control characters that JSON lets stand, DEL and U+0080 to U+009F, as "\u007f". Takes and returns JSON.
std::string EscapeControlsInJson(std::string_view json);

bool IsUtf8(std::string_view text);

// The character that a text, which isn't empty, begins with: of broken UTF-8, its first byte.
std::string_view FirstCharacter(std::string_view text);

// U+FFFD in place of each byte of broken UTF-8.
std::string ReplaceBrokenUtf8(std::string_view text);

std::string EncodeBase64(std::string_view bytes);

// What is wrong, for a message: form with its "%" replaced by parts, in their order. A test holds the manual page to
// the forms, so they are literals.
std::string MakeMessage(std::string_view form, std::initializer_list<std::string_view> parts = {});

// A name in a message: an empty one is "''".
std::string QuoteEmpty(std::string_view name);

// "0.25"
std::string FormatSeconds(std::chrono::duration<double> time);

// "512 bytes", "1.5 MiB".
std::string DescribeBytes(double bytes);
