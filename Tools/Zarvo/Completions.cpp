// Prints a shell's completions for zarvo, made of the table of options: ZarvoCompletions bash|zsh|fish
#include "Tools/Zarvo/Options.h"

#include <cstdio>
#include <cstring>

namespace {

std::string Join(const std::vector<std::string>& words, const char* between) {
    std::string text;
    for (const std::string& word : words)
        text += (text.empty() ? "" : between) + word;
    return text;
}

std::string Replace(std::string text, std::string_view from, std::string_view to) {
    for (size_t at = text.find(from); at != std::string::npos; at = text.find(from, at + to.size()))
        text.replace(at, from.size(), to);
    return text;
}

// "-j", "--threads"
std::vector<std::string> GetForms(const Option& option) {
    std::vector<std::string> forms;
    if (option.letter != 0) forms.push_back({'-', option.letter});
    if (!option.name.empty()) forms.push_back("--" + std::string(option.name));
    return forms;
}

std::string GetChoices(const Option& option) { return Replace(std::string(option.choices), "|", " "); }

// The case that completes the value of an option, such as "--progress) ...;;". Files are readline's own completion,
// which knows of quotes and "~".
std::string MakeBashValueCase(const Option& option) {
    std::string action = "return";
    if (option.kind != ValueKind::kFile) action = "compopt +o default; " + action;
    if (option.kind == ValueKind::kChoice)
        action = "mapfile -t COMPREPLY < <(compgen -W '" + GetChoices(option) + "' -- \"$word\"); " + action;
    return "        " + Join(GetForms(option), "|") + ") " + action + " ;;\n";
}

std::string MakeBashSubcommandCase(const Subcommand& subcommand) {
    std::vector<std::string> forms;
    std::string values;
    for (const Option* const option : subcommand.options) {
        for (const std::string& form : GetForms(*option))
            forms.push_back(form);
        if (!option->value.empty()) values += MakeBashValueCase(*option);
    }
    return "    '" + std::string(subcommand.name) + "') options='" + Join(forms, " ") + "'\n        case $before in\n" +
           values + "        esac ;;\n";
}

std::string MakeBash() {
    std::vector<std::string> names;
    std::string cases = MakeBashSubcommandCase(kNoSubcommand);
    for (const Subcommand* const subcommand : GetSubcommands()) {
        names.emplace_back(subcommand->name);
        cases += MakeBashSubcommandCase(*subcommand);
    }
    return "# Completes zarvo in bash. Made by the build.\n"
           "_zarvo() {\n"
           "    local word=${COMP_WORDS[COMP_CWORD]} before=${COMP_WORDS[COMP_CWORD-1]} subcommand='' options index\n"
           "    # Readline makes three words of --name=value.\n"
           "    if [[ $word == '=' ]]; then word=''; elif [[ $before == '=' ]]; then "
           "before=${COMP_WORDS[COMP_CWORD-2]}; fi\n"
           "    COMPREPLY=()\n"
           "    for ((index = 1; index < COMP_CWORD; ++index)); do\n"
           "        case ${COMP_WORDS[index]} in\n"
           "        --) return ;;\n"
           "        " +
           Join(names, "|") +
           ") [[ -n $subcommand ]] || subcommand=${COMP_WORDS[index]} ;;\n"
           "        esac\n"
           "    done\n"
           "    case $subcommand in\n" +
           cases +
           "    esac\n"
           "    if [[ $word == -* ]]; then\n"
           "        mapfile -t COMPREPLY < <(compgen -W \"$options\" -- \"$word\")\n"
           "    elif [[ -z $subcommand ]]; then\n"
           "        mapfile -t COMPREPLY < <(compgen -W '" +
           Join(names, " ") +
           "' -- \"$word\")\n"
           "    fi\n"
           "}\n"
           "complete -o default -F _zarvo zarvo\n";
}

// An optspec for each form, such as "'--threads=[threads to use]:N: '".
std::string MakeZshOption(const Option& option) {
    const std::vector<std::string> forms = GetForms(option);
    const bool takesValue = !option.value.empty();
    std::string text = std::string(option.help);
    for (const char* const special : {"[", "]", ":"})
        text = Replace(text, special, std::string("\\") + special);
    text = '[' + Replace(text, "'", "'\\''") + ']';
    if (takesValue) {
        std::string values = " ";
        if (option.kind == ValueKind::kChoice) values = '(' + GetChoices(option) + ')';
        if (option.kind == ValueKind::kFile) values = "_files";
        text += ':' + std::string(option.value) + ':' + values;
    }
    std::string optspecs;
    for (const std::string& form : forms) {
        const char* const mark = form.starts_with("--") ? "=" : "+"; // the value may stand in the same word
        optspecs += " \\\n            '" + form + (takesValue ? mark : "") + text + '\'';
    }
    return optspecs;
}

std::string MakeZsh() {
    std::string names, cases;
    for (const Subcommand* const subcommand : GetSubcommands()) {
        names += "        '" + std::string(subcommand->name) + ":" + std::string(subcommand->summary) + "'\n";
        cases += "    " + std::string(subcommand->name) + ")\n        _arguments -s -S";
        for (const Option* const option : subcommand->options)
            cases += MakeZshOption(*option);
        cases += " \\\n            '*:file:_files' ;;\n";
    }
    std::string options;
    for (const Option* const option : kNoSubcommand.options)
        options += MakeZshOption(*option);
    return "#compdef zarvo\n"
           "# Completes zarvo in zsh. Made by the build.\n"
           "_zarvo() {\n"
           "    local curcontext=$curcontext state line\n"
           "    local -a subcommands=(\n" +
           names +
           "    )\n"
           "    _arguments -C -s" +
           options +
           " \\\n            '1:subcommand:->subcommand' \\\n            '*::argument:->arguments'\n"
           "    case $state in\n"
           "    subcommand) _describe subcommand subcommands; return ;;\n"
           "    arguments) ;;\n"
           "    *) return ;;\n"
           "    esac\n"
           "    case $words[1] in\n" +
           cases +
           "    esac\n"
           "}\n"
           "_zarvo \"$@\"\n";
}

std::string MakeFishOption(const std::string& condition, const Option& option) {
    std::string text = "complete -c zarvo -n '" + condition + "'";
    if (option.letter != 0) text += std::string(" -s ") + option.letter;
    if (!option.name.empty()) text += " -l " + std::string(option.name);
    if (option.kind == ValueKind::kFile)
        text += " -r -F";
    else if (!option.value.empty())
        text += " -x -a '" + GetChoices(option) + "'";
    return text + " -d '" + Replace(std::string(option.help), "'", "\\'") + "'\n";
}

std::string MakeFish() {
    constexpr const char* kNone = "__fish_use_subcommand";
    std::string text = "# Completes zarvo in fish. Made by the build.\n";
    for (const Option* const option : kNoSubcommand.options)
        text += MakeFishOption(kNone, *option);
    for (const Subcommand* const subcommand : GetSubcommands()) {
        text += "complete -c zarvo -n " + std::string(kNone) + " -f -a " + std::string(subcommand->name) + " -d '" +
                std::string(subcommand->summary) + "'\n";
        for (const Option* const option : subcommand->options)
            text += MakeFishOption("__fish_seen_subcommand_from " + std::string(subcommand->name), *option);
    }
    return text;
}

} // namespace

int main(int argumentCount, char** arguments) {
    const char* const shell = argumentCount == 2 ? arguments[1] : "";
    std::string text;
    if (strcmp(shell, "bash") == 0) text = MakeBash();
    if (strcmp(shell, "zsh") == 0) text = MakeZsh();
    if (strcmp(shell, "fish") == 0) text = MakeFish();
    if (text.empty()) {
        fprintf(stderr, "Usage: ZarvoCompletions bash|zsh|fish\n");
        return 2;
    }
    return fputs(text.c_str(), stdout) >= 0 && fflush(stdout) == 0 ? 0 : 1;
}
