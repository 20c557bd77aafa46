#include "Runtime/Utilities/PathNameUtility.h"

#include <cstring>

using core::string_ref;

void AppendPathNameImpl(string_ref base, string_ref tail, char separator, core::string& out) {
    // Reserved at once: a path cut short would name something else.
    if (out.grow(base.size() + tail.size() + 1) == nullptr) return;
    out += base;
    if (!base.empty() && !tail.empty()) {
        const bool isBaseEnded = base[base.size() - 1] == separator;
        const bool isTailStarted = tail[0] == separator;
        if (isBaseEnded && isTailStarted)
            tail = tail.substr(1);
        else if (!isBaseEnded && !isTailStarted)
            out += separator;
    }
    out += tail;
}

static string_ref TrimTrailingSeparators(string_ref path) {
    while (!path.empty() && path[path.size() - 1] == '/')
        path = path.substr(0, path.size() - 1);
    return path;
}

string_ref DeleteLastPathNameComponent(string_ref path) {
    path = TrimTrailingSeparators(path);
    const size_t separator = path.rfind('/');
    if (separator == string_ref::npos) return {};
    path = TrimTrailingSeparators(path.substr(0, separator));
    return path.empty() ? string_ref("/", 1) : path;
}

string_ref GetLastPathNameComponent(string_ref path) { return path.substr(path.rfind('/') + 1); }

string_ref GetPathNameExtension(string_ref path) {
    const string_ref name = GetLastPathNameComponent(path);
    const size_t dot = name.rfind('.');
    return dot == string_ref::npos ? string_ref() : name.substr(dot + 1);
}

string_ref SkipPathPrefix(string_ref path, string_ref prefix, bool atStart, ComparisonType comparison) {
    size_t position = 0;
    if (atStart) {
        if (!path.starts_with(prefix, comparison)) return path;
    } else {
        position = comparison == kCaseInsensitive ? path.find_case_insensitive(prefix.data(), 0, prefix.size())
                                                  : path.find(prefix);
    }
    string_ref rest = position == string_ref::npos ? path : path.substr(position + prefix.size());
    while (!rest.empty() && rest[0] == '/')
        rest = rest.substr(1);
    return rest;
}

void ConvertSeparatorsToZarvo(char* path) {
    while ((path = strchr(path, '\\')) != nullptr)
        *path = '/';
}
