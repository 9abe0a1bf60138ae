#include "common/manual.h"

#include <algorithm>
#include <cctype>
#include <cstdio>

namespace vrx::apps {

namespace {

using Options = std::vector<const CLI::Option*>;
using Verbs = std::vector<const CLI::App*>;

// The options that help shows: those without a group are hidden. --help is listed once, for the whole program.
Options optionsOf(const CLI::App& app) {
    Options options;
    for (const CLI::Option* option : app.get_options())
        if (!option->get_group().empty() && (option != app.get_help_ptr() || !app.get_parent()))
            options.push_back(option);
    for (const CLI::App* group : app.get_subcommands([](const CLI::App* inner) { return inner->get_name().empty(); })) {
        const Options inner = optionsOf(*group);
        options.insert(options.end(), inner.begin(), inner.end());
    }
    return options;
}

Verbs verbsOf(const CLI::App& app) {
    return app.get_subcommands([](const CLI::App* inner) { return !inner->get_name().empty(); });
}

// Calls for the app and all verbs below it, with the verbs' names that lead there.
template <class F>
void forEach(const CLI::App& app, const std::string& path, F use) {
    use(app, path);
    for (const CLI::App* verb : verbsOf(app)) forEach(*verb, path + " " + verb->get_name(), use);
}

std::string replaced(std::string text, const std::map<char, std::string>& replacements) {
    std::string result;
    for (char c : text) {
        auto replacement = replacements.find(c);
        replacement == replacements.end() ? result += c : result += replacement->second;
    }
    return result;
}

// Manual pages.

std::string roff(const std::string& text) {
    std::string result;
    for (std::size_t begin = 0; begin <= text.size();) {
        const std::size_t end = std::min(text.find('\n', begin), text.size());
        const std::string line = replaced(text.substr(begin, end - begin), {{'\\', "\\e"}, {'-', "\\-"}});
        result += line.starts_with('.') || line.starts_with('\'') ? "\\&" + line : line;
        if (end < text.size()) result += '\n';
        begin = end + 1;
    }
    return result;
}

std::string typeOf(const CLI::Option& option) {
    return option.get_items_expected_max() > 0 ? option.get_type_name() : "";
}

std::string manOptions(const CLI::App& app) {
    std::string text;
    for (const CLI::Option* option : optionsOf(app)) {
        const bool isPositional = option->get_positional() && option->get_lnames().empty();
        text += ".TP\n\\fB" + roff(replaced(option->get_name(isPositional, true), {{',', ", "}})) + "\\fR";
        if (!isPositional && !typeOf(*option).empty()) text += " \\fI" + roff(typeOf(*option)) + "\\fR";
        text += "\n" + roff(option->get_description()) + "\n";
    }
    return text;
}

std::string synopsis(const CLI::App& app) {
    std::string text;
    for (const CLI::Option* option : optionsOf(app))
        if (option->get_positional() && option->get_lnames().empty())
            text += option->get_required() ? " " + option->get_name(true) : " [" + option->get_name(true) + "]";
    return text;
}

std::string manSection(const char* heading, const ManualNotes::Lines& lines) {
    std::string text = lines.empty() ? "" : ".SH " + std::string(heading) + "\n";
    for (const auto& [word, meaning] : lines) text += ".TP\n\\fB" + roff(word) + "\\fR\n" + roff(meaning) + "\n";
    return text;
}

std::string manPage(const CLI::App& app, const ManualNotes& notes) {
    const std::string& name = app.get_name();
    const bool hasVerbs = !verbsOf(app).empty();
    std::string text = ".TH " + replaced(name, {{'-', "\\-"}}) + " 1 \"\" \"vrxagent " VRX_VERSION "\"\n";
    text += ".SH NAME\n" + roff(name) + " \\- " + roff(app.get_description()) + "\n";
    text += ".SH SYNOPSIS\n.B " + roff(name) + "\n" + roff(hasVerbs ? "[OPTION]... VERB [OPTION]..." : "[OPTION]...") +
            "\n.SH OPTIONS\n" + manOptions(app);
    if (hasVerbs) text += ".SH VERBS\n";
    forEach(app, "", [&](const CLI::App& verb, const std::string& path) {
        if (path.empty()) return;
        text += ".SS \"" + roff(path.substr(1) + synopsis(verb)) + "\"\n" + roff(verb.get_description()) + "\n" +
                manOptions(verb);
    });
    if (!app.get_footer().empty()) text += ".SH NOTES\n.nf\n" + roff(app.get_footer()) + "\n.fi\n";
    text += manSection("EXIT STATUS", notes.exitCodes) + manSection("FILES", notes.files) +
            manSection("ENVIRONMENT", notes.environment) + manSection("EXAMPLES", notes.examples);
    std::string pages;
    for (const std::string& page : notes.seeAlso) pages += (pages.empty() ? "" : ", ") + roff(page);
    return pages.empty() ? text : text + ".SH SEE ALSO\n" + pages + "\n";
}

// Completions.

struct Candidate {
    std::string word;
    std::string help;
};

std::vector<Candidate> candidatesOf(const CLI::App& app) {
    std::vector<Candidate> candidates;
    for (const CLI::App* verb : verbsOf(app)) candidates.push_back({verb->get_name(), verb->get_description()});
    for (const CLI::Option* option : optionsOf(app))
        for (const std::string& name : option->get_lnames())
            candidates.push_back({"--" + name, option->get_description()});
    return candidates;
}

// With the options of the verbs above it, which may stand anywhere.
std::vector<Candidate> allCandidatesOf(const CLI::App& app) {
    std::vector<Candidate> candidates = candidatesOf(app);
    for (const CLI::App* above = app.get_parent(); above; above = above->get_parent())
        for (const Candidate& candidate : candidatesOf(*above))
            if (candidate.word.starts_with("--")) candidates.push_back(candidate);
    return candidates;
}

// The command that prints the words for the verb's argument; empty where there are none.
std::string wordsCommand(const CLI::App& app, const CLI::App& verb, const ManualNotes& notes) {
    for (const CLI::Option* option : optionsOf(verb))
        if (option->get_positional() && option->get_lnames().empty() && notes.words.contains(option->get_name(true)))
            return app.get_name() + " --candidates " + option->get_name(true) + " 2>/dev/null";
    return "";
}

// Shells expand what they are offered, and serial numbers come from elsewhere.
bool isPlainWord(const std::string& word) {
    return !word.empty() && !word.starts_with('-') && std::ranges::all_of(word, [](unsigned char c) {
        return c < 0x80 && (std::isalnum(c) || c == '.' || c == '_' || c == '-');
    });
}

void printCandidates(const ManualNotes& notes, const std::string& argument) {
    const auto words = notes.words.find(argument);
    if (words == notes.words.end()) return;
    for (const std::string& word : words->second())
        if (isPlainWord(word)) std::printf("%s\n", word.c_str());
}

// In bash and zsh the verbs before the cursor select the candidates.
std::string verbPattern(const std::string& path) {
    return "\"" + path + "\"";
}

std::string verbCases(const CLI::App& app) {
    std::string text = "        case \"$verb $word\" in\n";
    forEach(app, "", [&](const CLI::App&, const std::string& path) {
        if (!path.empty()) text += "            " + verbPattern(path) + ") verb=" + verbPattern(path) + " ;;\n";
    });
    return text + "        esac\n";
}

std::string bashCompletion(const CLI::App& app, const ManualNotes& notes) {
    const std::string function = "_" + replaced(app.get_name(), {{'-', "_"}});
    std::string text = function +
                       "() {\n    local verb=\"\" word candidates=\"\"\n"
                       "    for word in \"${COMP_WORDS[@]:1:COMP_CWORD-1}\"; do\n" +
                       verbCases(app) + "    done\n    case \"$verb\" in\n";
    forEach(app, "", [&](const CLI::App& verb, const std::string& path) {
        std::string words;
        for (const Candidate& candidate : allCandidatesOf(verb)) words += (words.empty() ? "" : " ") + candidate.word;
        const std::string command = wordsCommand(app, verb, notes);
        if (!command.empty()) words += " $(" + command + ")";
        text += "        " + verbPattern(path) + ") candidates=\"" + words + "\" ;;\n";
    });
    return text +
           "    esac\n    mapfile -t COMPREPLY < <(compgen -W \"$candidates\" -- \"${COMP_WORDS[COMP_CWORD]}\")\n}\n" +
           "complete -o default -F " + function + " " + app.get_name() + "\n";
}

std::string shellQuoted(const std::string& text) {
    return "'" + replaced(text, {{'\'', "'\\''"}}) + "'";
}

std::string zshCompletion(const CLI::App& app, const ManualNotes& notes) {
    std::string text = "#compdef " + app.get_name() +
                       "\nlocal verb=\"\" word\nlocal -a candidates\n"
                       "for word in ${words[2,CURRENT-1]}; do\n" +
                       verbCases(app) + "done\ncase \"$verb\" in\n";
    forEach(app, "", [&](const CLI::App& verb, const std::string& path) {
        text += "    " + verbPattern(path) + ") candidates=(";
        for (const Candidate& candidate : allCandidatesOf(verb))
            text += "\n        " + shellQuoted(candidate.word + ":" + candidate.help);
        const std::string command = wordsCommand(app, verb, notes);
        if (!command.empty()) text += "\n        ${(f)\"$(" + command + ")\"}";
        text += ") ;;\n";
    });
    return text + "esac\n_describe -o " + app.get_name() + " candidates || _files\n";
}

std::string fishCompletion(const CLI::App& app, const ManualNotes& notes) {
    std::string text;
    forEach(app, "", [&](const CLI::App& verb, const std::string& path) {
        std::string condition = "__fish_use_subcommand";
        if (!path.empty()) {
            condition.clear();
            for (std::size_t begin = 1; begin < path.size(); begin = path.find(' ', begin) + 1) {
                const std::string name = path.substr(begin, path.find(' ', begin) - begin);
                condition += (condition.empty() ? "" : "; and ") + std::string("__fish_seen_subcommand_from ") + name;
                if (path.find(' ', begin) == std::string::npos) break;
            }
        }
        // The program's own options may stand anywhere.
        for (const Candidate& candidate : candidatesOf(verb)) {
            const bool isOption = candidate.word.starts_with("--");
            text += "complete -c " + app.get_name();
            if (!isOption || !path.empty()) text += " -n " + shellQuoted(condition);
            text += isOption ? " -l " + candidate.word.substr(2) : " -f -a " + candidate.word;
            text += " -d " + shellQuoted(candidate.help) + "\n";
        }
        const std::string command = wordsCommand(app, verb, notes);
        if (!command.empty())
            text += "complete -c " + app.get_name() + " -n " + shellQuoted(condition) + " -f -a '(" + command + ")'\n";
    });
    return text;
}

}  // namespace

ManualNotes::Lines agentFiles() {
    return {{"~/.local/state/vrxagent/host.db", "Settings, follow-ups and activities of a user's agent"},
            {"/var/lib/vrxagent/host.db", "Those of the system's agent"},
            {"/etc/vrxagent/device.toml, /etc/vrxagent/device.d/, ~/.config/vrxagent/device.toml",
             "The device profile, whose files are joined key by key"},
            {"$XDG_RUNTIME_DIR/com.orvane.vrxagent, /run/vrxagent/com.orvane.vrxagent",
             "The sockets of a user's agent and of the system's"}};
}

ManualNotes::Lines agentEnvironment() {
    return {{"VRXAGENT_SOCKET", "The socket of the agent to ask, where --socket names none"},
            {"STATE_DIRECTORY, XDG_STATE_HOME", "Where the agent's home is, where --home names none"},
            {"XDG_RUNTIME_DIR", "Where the socket of a user's agent is"},
            {"XDG_CONFIG_HOME", "Where a user's device profile is"}};
}

std::string manual(const CLI::App& app, const ManualNotes& notes, ManualForm form) {
    switch (form) {
        case ManualForm::Man: return manPage(app, notes);
        case ManualForm::Bash: return bashCompletion(app, notes);
        case ManualForm::Zsh: return zshCompletion(app, notes);
        case ManualForm::Fish: return fishCompletion(app, notes);
    }
    return "";
}

void addManualOption(CLI::App& app, const ManualNotes& notes) {
    static const std::map<std::string, ManualForm> forms{
        {"man", ManualForm::Man}, {"bash", ManualForm::Bash}, {"zsh", ManualForm::Zsh}, {"fish", ManualForm::Fish}};
    app.add_option_function<ManualForm>("--manual",
                                        [&](const ManualForm& form) {
                                            std::fputs(manual(app, notes, form).c_str(), stdout);
                                            throw CLI::Success();
                                        })
        ->transform(CLI::CheckedTransformer(forms))
        ->trigger_on_parse()
        ->group("");
    app.add_option_function<std::string>("--candidates",
                                         [&](const std::string& argument) {
                                             printCandidates(notes, argument);
                                             throw CLI::Success();
                                         })
        ->group("");
}

}  // namespace vrx::apps
