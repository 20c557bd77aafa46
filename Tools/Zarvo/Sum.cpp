#include "Tools/Zarvo/Run.h"
#include "Tools/Zarvo/Selection.h"
#include "Tools/Zarvo/Text.h"

#include <algorithm>
#include <array>
#include <memory>
#include <mutex>
#include <new>
#include <openssl/evp.h>
#include <span>
#include <unordered_map>

namespace {

// What OpenSSL can fail for here is memory.
void Require(bool isDone) {
    if (!isDone) throw std::bad_alloc();
}

// The checksums of an archive's files, from the first bytes of each until its line is printed.
//
// Only files that are being read have a context. What they end in is kept in groups of neighbouring entries, which are
// freed as their lines are printed. Any thread, but each file is one thread's at a time.
class Checksums {
public:
    Checksums(const EVP_MD* algorithm, size_t entryCount)
        : m_Algorithm(algorithm),
          m_Size(static_cast<size_t>(EVP_MD_get_size(algorithm))),
          m_Groups((entryCount + kGroupCount - 1) / kGroupCount) {}

    // Adds the bytes of a file that come next. isFirst, isLast: whether they are at its beginning, at its end.
    void Add(uint64_t entry, std::span<const std::byte> bytes, bool isFirst, bool isLast) {
        ContextPointer context = isFirst ? MakeContext() : TakeContext(entry);
        Require(EVP_DigestUpdate(context.get(), bytes.data(), bytes.size()) == 1);
        Digest digest;
        if (isLast) Require(EVP_DigestFinal_ex(context.get(), digest.data(), nullptr) == 1);
        std::lock_guard lock(m_Lock);
        if (!isLast) {
            m_Started[entry] = std::move(context);
            return;
        }
        std::unique_ptr<unsigned char[]>& group = m_Groups[entry / kGroupCount];
        if (group == nullptr) group = std::make_unique_for_overwrite<unsigned char[]>(kGroupCount * m_Size);
        std::copy_n(digest.data(), m_Size, group.get() + entry % kGroupCount * m_Size);
        m_Unused.push_back(std::move(context));
    }

    // A file whose end will not come.
    void Drop(uint64_t entry) {
        std::lock_guard lock(m_Lock);
        m_Started.erase(entry);
    }

    // The checksum of a file whose end has been added, in hexadecimal digits. Forgets those of the groups before its.
    std::string Take(uint64_t entry) {
        Digest digest;
        {
            std::lock_guard lock(m_Lock);
            for (; m_FirstGroup < entry / kGroupCount; ++m_FirstGroup)
                m_Groups[m_FirstGroup].reset();
            std::copy_n(m_Groups[m_FirstGroup].get() + entry % kGroupCount * m_Size, m_Size, digest.data());
        }
        constexpr char kDigits[] = "0123456789abcdef";
        std::string text(2 * m_Size, '\0');
        for (size_t index = 0; index < m_Size; ++index) {
            text[2 * index] = kDigits[digest[index] >> 4];
            text[2 * index + 1] = kDigits[digest[index] & 15];
        }
        return text;
    }

private:
    static constexpr size_t kGroupCount = 1'024;

    struct FreeContext {
        void operator()(EVP_MD_CTX* context) const { EVP_MD_CTX_free(context); }
    };
    using ContextPointer = std::unique_ptr<EVP_MD_CTX, FreeContext>;
    using Digest = std::array<unsigned char, EVP_MAX_MD_SIZE>;

    // One that has been used is made ready much faster than a new one.
    ContextPointer MakeContext() {
        ContextPointer context;
        {
            std::lock_guard lock(m_Lock);
            if (!m_Unused.empty()) {
                context = std::move(m_Unused.back());
                m_Unused.pop_back();
            }
        }
        if (context == nullptr) context.reset(EVP_MD_CTX_new());
        Require(context != nullptr && EVP_DigestInit_ex(context.get(), m_Algorithm, nullptr) == 1);
        return context;
    }

    ContextPointer TakeContext(uint64_t entry) {
        std::lock_guard lock(m_Lock);
        return std::move(m_Started.extract(entry).mapped());
    }

    const EVP_MD* const m_Algorithm;
    const size_t m_Size; // of a checksum, in bytes

    std::mutex m_Lock; // for what follows
    std::unordered_map<uint64_t, ContextPointer> m_Started;
    std::vector<ContextPointer> m_Unused;
    std::vector<std::unique_ptr<unsigned char[]>> m_Groups; // null: none of its files has ended
    size_t m_FirstGroup = 0;                                // those before it were printed
};

// A line as sha256sum prints it, without its end. name: a path below the folder; it has no backslash.
std::string MakeLine(const std::string& checksum, std::string_view name) {
    const bool isEscaped = name.find_first_of("\n\r") != std::string_view::npos;
    std::string line = isEscaped ? "\\" : "";
    line += checksum;
    line += "  ";
    if (name.starts_with('-')) line += "./";
    if (!isEscaped) return line.append(name);
    for (const char character : name)
        switch (character) {
        case '\n': line += "\\n"; break;
        case '\r': line += "\\r"; break;
        default: line += character;
        }
    return line;
}

struct FreeAlgorithm {
    void operator()(EVP_MD* algorithm) const { EVP_MD_free(algorithm); }
};

} // namespace

int RunSum(const Run& run) {
    const std::string& path = run.GetOperands()[0];
    const std::string* const given = run.arguments.Find(kAlgorithm);
    const std::string name = given != nullptr ? *given : "sha256";
    const std::unique_ptr<EVP_MD, FreeAlgorithm> algorithm(EVP_MD_fetch(nullptr, name.c_str(), nullptr));
    if (algorithm == nullptr) {
        run.console.Say(name, MakeMessage("this system's OpenSSL does not offer it"));
        return kSomethingWrong;
    }
    std::optional<zarvo::archive> archive = run.OpenArchive(path);
    if (!archive) return kNoArchive;
    const PatternList list = ReadPatterns(run);
    zarvo::patterns wanted;
    if (!AddPatterns(run, path, list.patterns, wanted)) return kSomethingWrong;

    Progress progress(run.arguments, run.console, true);
    zarvo::run_options options = run.MakeOptions(progress);
    if (!list.isEverything) options.wanted = &wanted;
    Checksums checksums(algorithm.get(), archive->entries().size());
    zarvo::visit_options what;
    what.bytes = [&](uint64_t index, uint64_t offset, std::span<const std::byte> bytes) {
        const bool isLast = offset + bytes.size() == archive->entries()[index].size();
        checksums.Add(index, bytes, offset == 0, isLast);
    };
    what.report = [&](const zarvo_report& report) {
        const zarvo::entry entry = archive->entries()[report.index];
        if (report.outcome == ZARVO_OUTCOME_FAILED) {
            checksums.Drop(report.index);
            run.SayOfEntry(path, entry.path(), report.text);
        } else if (entry.is_file()) {
            if (entry.size() == 0) checksums.Add(report.index, {}, true, true);
            if (run.output.IsTerminal()) run.console.WipeProgress();
            run.output.WriteText(MakeLine(checksums.Take(report.index), zarvo::normalize_path(entry.path())));
            run.output.Write("\n");
        }
    };
    const zarvo::run_result result = archive->visit(options, what);
    if (run.output.IsAbandoned()) return kSomethingWrong;
    if (result.error) run.console.Say(path, result.error.text());
    const bool areUsed = result.error.code() == ZARVO_ERROR_MEMORY || SayUnused(run, path, list, wanted);
    return result.error || result.summary.failures != 0 || !areUsed || !list.isComplete ? kSomethingWrong : kAllDone;
}
