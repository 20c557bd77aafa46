#include "Tools/Zarvo/Run.h"
#include "Tools/Zarvo/Selection.h"
#include "Tools/Zarvo/Text.h"

#include <array>
#include <new>
#include <openssl/evp.h>
#include <span>

namespace {

// What OpenSSL can fail for here is memory.
void Require(bool isDone) {
    if (!isDone) throw std::bad_alloc();
}

// One file's checksum while it is made. One thread at a time.
class Checksum {
public:
    explicit Checksum(const EVP_MD* algorithm) : m_Context(EVP_MD_CTX_new()) {
        Require(m_Context != nullptr && EVP_DigestInit_ex(m_Context.get(), algorithm, nullptr) == 1);
    }

    void Add(std::span<const std::byte> bytes) {
        Require(EVP_DigestUpdate(m_Context.get(), bytes.data(), bytes.size()) == 1);
    }

    // After the last byte. Frees what only adding needs, as many results may wait for their turn.
    void End() {
        Require(EVP_DigestFinal_ex(m_Context.get(), m_Bytes.data(), &m_Size) == 1);
        m_Context.reset();
    }

    std::string Format() const {
        constexpr char kDigits[] = "0123456789abcdef";
        std::string text;
        for (const unsigned char byte : std::span(m_Bytes).first(m_Size))
            text.append({kDigits[byte >> 4], kDigits[byte & 15]});
        return text;
    }

private:
    struct FreeContext {
        void operator()(EVP_MD_CTX* context) const { EVP_MD_CTX_free(context); }
    };
    std::unique_ptr<EVP_MD_CTX, FreeContext> m_Context;
    std::array<unsigned char, EVP_MAX_MD_SIZE> m_Bytes;
    unsigned m_Size = 0;
};

// A line as sha256sum prints it, without its end. name: a path below the folder; it has no backslash.
std::string MakeLine(const Checksum& checksum, std::string_view name) {
    const bool isEscaped = name.find_first_of("\n\r") != std::string_view::npos;
    std::string line = isEscaped ? "\\" : "";
    line += checksum.Format();
    line += "  ";
    if (name.starts_with('-')) line += "./";
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
    std::vector<std::unique_ptr<Checksum>> checksums(archive->entries().size()); // each its file's thread's
    zarvo::visit_options what;
    what.bytes = [&](uint64_t index, uint64_t offset, std::span<const std::byte> bytes) {
        std::unique_ptr<Checksum>& checksum = checksums[index];
        if (checksum == nullptr) checksum = std::make_unique<Checksum>(algorithm.get());
        checksum->Add(bytes);
        if (offset + bytes.size() == archive->entries()[index].size()) checksum->End();
    };
    what.report = [&](const zarvo_report& report) {
        const zarvo::entry entry = archive->entries()[report.index];
        std::unique_ptr<Checksum> checksum = std::move(checksums[report.index]);
        if (report.outcome == ZARVO_OUTCOME_FAILED) {
            run.SayOfEntry(path, entry.path(), report.text);
        } else if (entry.is_file()) {
            if (checksum == nullptr) { // no bytes
                checksum = std::make_unique<Checksum>(algorithm.get());
                checksum->End();
            }
            if (run.output.IsTerminal()) run.console.WipeProgress();
            run.output.WriteText(MakeLine(*checksum, zarvo::normalize_path(entry.path())));
            run.output.Write("\n");
        }
    };
    const zarvo::run_result result = archive->visit(options, what);
    if (run.output.IsAbandoned()) return kSomethingWrong;
    if (result.error) run.console.Say(path, result.error.text());
    const bool areUsed = result.error.code() == ZARVO_ERROR_MEMORY || SayUnused(run, path, list, wanted);
    return result.error || result.summary.failures != 0 || !areUsed || !list.isComplete ? kSomethingWrong : kAllDone;
}
