#include "Tools/Zarvo/Command.h"

#include "Tools/Zarvo/Run.h"
#include "Tools/Zarvo/Text.h"

#include <csignal>
#include <cstring>
#include <new>

namespace {

int RunSubcommand(const World& world, OutputBuffer& output, Console& console, std::string& done) {
    const Arguments arguments(world.arguments);
    const Subcommand* const subcommand = &arguments.GetSubcommand();
    if (!arguments.GetComplaint().empty()) return RefuseUsage(console, *subcommand, arguments.GetComplaint());
    if (arguments.Has(kHelp)) {
        output.Write(DescribeSubcommand(*subcommand));
        return kAllDone;
    }
    if (arguments.Has(kVersion)) {
        output.Write("zarvo " + std::string(zarvo::version()) + "\n");
        return kAllDone;
    }

    const Run run = {.arguments = arguments, .input = world.input, .output = output, .console = console, .done = done};
    if (subcommand == &kList) return RunList(run);
    if (subcommand == &kInfo) return RunInfo(run);
    if (subcommand == &kExtract) return RunExtract(run);
    if (subcommand == &kCat) return RunCat(run);
    if (subcommand == &kTest) return RunTest(run);
    if (subcommand == &kCreate) return RunCreate(run);
    if (subcommand == &kSum) return RunSum(run);
    return RunMount(run);
}

} // namespace

Ending RunZarvo(const World& world) {
    OutputBuffer output(world.output, world.isOutputTerminal, world.signal);
    Console console(world.error, world.isErrorTerminal, output);
    int status = kSomethingWrong;
    std::string done;
    try {
        status = RunSubcommand(world, output, console, done);
    } catch (const std::bad_alloc&) {
        console.Say(MakeMessage("Cannot allocate memory"));
    }
    output.Flush();
    if (output.HasSignal()) {
        const int signal = *world.signal;
        if (done.empty()) done = std::to_string(output.GetWritten()) + " bytes of results";
        console.Say(MakeMessage("ended by SIG% after %", {sigabbrev_np(signal), done}));
        return {.status = kSomethingWrong, .signal = signal};
    }
    if (output.GetError() == EPIPE) return {.status = kSomethingWrong, .signal = SIGPIPE};
    if (output.GetError() != 0) {
        console.Say("standard output", strerror(output.GetError()));
        return {.status = kSomethingWrong};
    }
    return {.status = status};
}
