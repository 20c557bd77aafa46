// What the command asks of the library, whose functions are called by way of these.
#include "Tests/Tools/Zarvo/ZarvoTest.h"

#include <dlfcn.h>
#include <zarvo.h>

namespace {

uint64_t s_Memory = 0;
uint32_t s_Threads = 0;

// Keeps the options, and returns the library's own function.
template <typename Function>
Function* Keep(const char* name, const zarvo_run_options* options) {
    s_Memory = options->memory;
    s_Threads = options->threads;
    return reinterpret_cast<Function*>(dlsym(RTLD_NEXT, name));
}

} // namespace

zarvo_code zarvo_extract(zarvo_archive* archive, const char* folder, const zarvo_run_options* options,
                         const zarvo_extract_options* how, zarvo_summary* summary, zarvo_error** error) {
    return Keep<decltype(zarvo_extract)>("zarvo_extract", options)(archive, folder, options, how, summary, error);
}
zarvo_code zarvo_test(zarvo_archive* archive, const zarvo_run_options* options, const zarvo_test_options* what,
                      zarvo_summary* summary, zarvo_error** error) {
    return Keep<decltype(zarvo_test)>("zarvo_test", options)(archive, options, what, summary, error);
}
zarvo_code zarvo_visit(zarvo_archive* archive, const zarvo_run_options* options, const zarvo_visit_options* what,
                       zarvo_summary* summary, zarvo_error** error) {
    return Keep<decltype(zarvo_visit)>("zarvo_visit", options)(archive, options, what, summary, error);
}
zarvo_code zarvo_create(const char* path, const char* folder, const zarvo_run_options* options,
                        const zarvo_create_options* how, zarvo_summary* summary, zarvo_error** error) {
    return Keep<decltype(zarvo_create)>("zarvo_create", options)(path, folder, options, how, summary, error);
}

namespace {

class ZarvoRunOptions : public ZarvoTest {};

TEST_F(ZarvoRunOptions, OfTheCommandLineReachTheLibrary) {
    MakeArchive("a.zarvo", Archive("a:x"));
    fs::create_directory("folder");
    const std::vector<std::string> kCases[] = {
        {"extract", "-q", "a.zarvo"}, {"test", "a.zarvo"}, {"sum", "a.zarvo"}, {"create", "-q", "new.zarvo", "folder"}};
    for (std::vector<std::string> arguments : kCases) {
        SCOPED_TRACE(arguments[0]);
        arguments.insert(arguments.end(), {"--memory=64M", "-j3"});
        s_Memory = 0;
        s_Threads = 0;
        EXPECT_EQ(0, Zarvo(arguments).status);
        EXPECT_EQ(64u << 20, s_Memory);
        EXPECT_EQ(3u, s_Threads);
    }
}

} // namespace
