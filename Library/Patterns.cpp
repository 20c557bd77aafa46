#include "Library/Patterns.h"

#include "Library/Glob.h"
#include "Library/Handles.h"
#include "Library/PathRules.h"
#include "Runtime/Allocator/Allocator.h"

constexpr UInt64 kHashSeed = 0; // patterns are the caller's own: nobody makes them collide

// Without what changes nothing: "/" at either end, and "./" in front.
static core::string_ref StripEnds(core::string_ref text) {
    while (true) {
        if (text.starts_with("/"))
            text = text.substr(1);
        else if (text.starts_with("./"))
            text = text.substr(2);
        else
            break;
    }
    while (!text.empty() && text.back() == '/')
        text = text.substr(0, text.size() - 1);
    return text;
}

// The slot of the patterns that name a path, or the empty one where they belong.
UInt32* zarvo_patterns::FindSlot(UInt64 hash, core::string_ref path) {
    size_t index = static_cast<size_t>(hash % m_Slots.size());
    while (m_Slots[index] != kNone && !IsSamePath(m_Patterns[m_Slots[index]].text, path))
        if (++index == m_Slots.size()) index = 0;
    return &m_Slots[index];
}

// Keeps the table half empty.
bool zarvo_patterns::MakeRoomForLiteral() {
    if (m_Patterns.size() * 2 <= m_Slots.size()) return true;
    dynamic_array<UInt32> old = std::move(m_Slots);
    if (!m_Slots.resize_uninitialized(m_Patterns.size() * 4, kResizeExact)) {
        m_Slots = std::move(old);
        return false;
    }
    std::fill(m_Slots.begin(), m_Slots.end(), kNone);
    for (const UInt32 head : old)
        if (head != kNone) *FindSlot(HashPath(m_Patterns[head].text, kHashSeed), m_Patterns[head].text) = head;
    return true;
}

zarvo_code zarvo_patterns::Add(core::string_ref text, Failure* failure) {
    const size_t count = m_Patterns.size();
    text = StripEnds(text);
    bool isOk = count < kNone && m_Patterns.resize_initialized(count + 1);
    if (isOk) {
        isOk = m_Patterns[count].text.grow(text.size()) != nullptr && MakeRoomForLiteral();
        if (isOk) m_Patterns[count].text = text;
        if (isOk && IsGlob(text)) isOk = m_Globs.try_push_back(static_cast<UInt32>(count));
    }
    if (!isOk) {
        m_Patterns.truncate(count);
        return failure->SetMemory();
    }
    const bool isEverything = LastComponent(text).empty();
    UInt32* const head = isEverything ? &m_Everything : FindSlot(HashPath(text, kHashSeed), text);
    m_Patterns[count].nextEqual = *head;
    *head = static_cast<UInt32>(count);
    return ZARVO_OK;
}

// Those that name the path or a folder that it lies in.
bool zarvo_patterns::UseLiterals(core::string_ref path) {
    bool isMatch = false;
    auto useAll = [&](UInt32 head) {
        isMatch = isMatch || head != kNone;
        for (; head != kNone; head = m_Patterns[head].nextEqual)
            m_Patterns[head].isUsed = true;
    };
    useAll(m_Everything);
    UInt64 hash = kHashSeed;
    for (PathComponents at(path); at.Next();) {
        hash = HashComponent(hash, at.Name());
        useAll(*FindSlot(hash, path.substr(0, at.End())));
    }
    return isMatch;
}

int zarvo_patterns::Match(core::string_ref path) {
    if (m_Patterns.empty()) return 0;
    bool isMatch = UseLiterals(path);
    if (m_Globs.empty()) return isMatch ? 1 : 0;

    char* const normal = m_Normal.grow(path.size() + 1);
    if (normal == nullptr) return -1;
    const core::string_ref normalForm(normal, zarvo_normalize_path(path.data(), path.size(), normal));
    const core::string_ref stored = StripEnds(path);
    for (const UInt32 index : m_Globs) {
        Pattern& pattern = m_Patterns[index];
        if (isMatch && pattern.isUsed) continue;
        const bool takes = MatchGlobOrFolder(pattern.text, normalForm) ||
                           (!(stored == normalForm) && MatchGlobOrFolder(pattern.text, stored));
        pattern.isUsed = pattern.isUsed || takes;
        isMatch = isMatch || takes;
    }
    return isMatch ? 1 : 0;
}

zarvo_code zarvo_patterns_new(zarvo_patterns** patterns, zarvo_error** error) {
    Failure failure;
    if (patterns == nullptr) return Deliver(failure.SetArgument("no place for the patterns"), failure, error);
    zarvo_patterns* made = New<zarvo_patterns>(kMemLabelGeneral);
    if (made == nullptr) return Deliver(failure.SetMemory(), failure, error);
    AddHandle(made);
    *patterns = made;
    return ZARVO_OK;
}

zarvo_code zarvo_patterns_add(zarvo_patterns* patterns, const char* pattern, size_t length, zarvo_error** error) {
    Failure failure;
    if (!IsLiveHandle(patterns) || pattern == nullptr)
        return Deliver(failure.SetArgument("no patterns, or no pattern to add"), failure, error);
    if (length == ZARVO_WHOLE) length = strlen(pattern);
    return Deliver(patterns->Add({pattern, length}, &failure), failure, error);
}

int zarvo_patterns_match(zarvo_patterns* patterns, const char* path, size_t length) {
    if (!IsLiveHandle(patterns) || path == nullptr) return 0;
    return patterns->Match({path, length == ZARVO_WHOLE ? strlen(path) : length});
}

int zarvo_patterns_used(const zarvo_patterns* patterns, size_t index) {
    return IsLiveHandle(patterns) && index < patterns->Count() && patterns->IsUsed(index) ? 1 : 0;
}

void zarvo_patterns_free(zarvo_patterns* patterns) {
    if (!IsLiveHandle(patterns)) return;
    RemoveHandle(patterns);
    Delete(patterns, kMemLabelGeneral);
}
