// zmcraster: build pyramids, look inside, compare. One command per source file; this one is the
// table of them and turns what they throw into messages and exit statuses.
#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdio>
#include <cstring>
#include <xercesc/util/XercesVersion.hpp>

#include "files/Lending.h"
#include "host/base/Error.h"
#include "host/file/Limits.h"
#include "platform/Interrupts.h"
#include "platform/Terminal.h"
#include "tools/Command.h"
#include "tools/GdalWorld.h"
#include "tools/Generate.h"
#include "tools/Suggestion.h"

namespace zmctools {
namespace {

// The version of the format that builds write.
constexpr const char* kFormatVersion = "1.1";

std::string Version() {
    return std::string("zmcraster " ZMC_VERSION "\npyramid format ") + kFormatVersion +
           "\nXerces-C++ " XERCES_FULLVERSIONDOT "\nGDAL " + GDALVersionInfo("RELEASE_NAME");
}

// A name of a lent source is good in the process that made it; one that is given here is nobody's,
// and must reach nothing.
CLI::Validator NotLent() {
    return CLI::Validator(
        [](std::string& text) {
            return zelm::files::LooksLent(text)
                       ? text + ": names of lent sources are not taken here"
                       : std::string();
        },
        "");
}

class Program {
public:
    Program();
    ExitStatus Run(std::vector<std::string> arguments);

private:
    CLI::App app{"build and inspect pyramid raster files", "zmcraster"};
    std::vector<std::unique_ptr<Command>> commands;
    std::vector<CLI::App*> parts;
    CLI::App* generate = nullptr;
    std::string generated;
    std::vector<std::string> limits;

    void Add(std::unique_ptr<Command> command);
    ExitStatus RunChosen();
    void ChangeLimits() const;
    void CheckCommand(const std::string& word) const;
    std::string WhatIsWrong(const CLI::ParseError& error) const;
};

Program::Program() {
    app.set_version_flag("--version", Version(),
                         "Print the versions of this program, of the file "
                         "format and of the libraries");
    app.set_help_flag("--help,-h", "Print this help");
    const std::string claims = "What a file may claim: " + zmchost::Limits().Text() +
                               " are the usual limits, and one that names another changes it; "
                               "stands before COMMAND";
    OptionTable(app).Texts("--limit", limits, claims.c_str()).Named("NAME=N");
    app.require_subcommand(1);
    Add(MakeBuildCommand());
    Add(MakePlanCommand());
    Add(MakePartCommand());
    Add(MakeFinishCommand());
    Add(MakeStatusCommand());
    Add(MakeUpdateCommand());
    Add(MakeInfoCommand());
    Add(MakeExportCommand());
    Add(MakePreviewCommand());
    Add(MakeServeCommand());
    Add(MakeHashCommand());
    Add(MakeVerifyCommand());
    Add(MakeCompareCommand());
    Add(MakeStatsCommand());
    Add(MakeRecoverCommand());
    app.footer(
        std::string("zmcraster COMMAND --help tells more, with examples. Bands count from 1, "
                    "levels from 0, the finest.\nExit status: ") +
        kExitStatusText + ".\n");
    generate = app.add_subcommand("generate", "Print the man page or the bash completion");
    generate->group("");
    generate->add_option("WHAT", generated)
        ->required()
        ->check(CLI::IsMember(std::vector<std::string>{"man", "completion"}));
}

void Program::Add(std::unique_ptr<Command> command) {
    CLI::App* const part = app.add_subcommand(command->Name(), command->Summary());
    OptionTable table(*part);
    command->Describe(table);
    for (CLI::Option* const option : part->get_options()) option->check(NotLent());
    table.Flag("--json", command->json, "Print one JSON document instead of text");
    table.Flag("--quiet,-q", command->quiet, "No progress bar, no warnings, errors only");
    parts.push_back(part);
    commands.push_back(std::move(command));
}

ExitStatus Program::RunChosen() {
    if (generate->parsed()) {
        const std::string text = generated == "man" ? MakeManPage(app) : MakeCompletion(app);
        return std::fputs(text.c_str(), stdout) >= 0 && std::fflush(stdout) == 0
                   ? ExitStatus::Done
                   : ExitStatus::Failed;
    }
    for (std::size_t i = 0; i < parts.size(); ++i) {
        if (!parts[i]->parsed()) continue;
        SetQuiet(commands[i]->quiet);
        platform::CatchInterrupts();
        ChangeLimits();
        StartGdal();
        const ExitStatus status = commands[i]->Run();
        if (std::fflush(stdout) != 0) throw Failure("standard output", "it cannot be written");
        return status;
    }
    return ExitStatus::Usage;
}

void Program::ChangeLimits() const {
    for (const std::string& text : limits) try {
            zmchost::Limits::Change(text);
        } catch (const zmchost::Error& error) {
            throw UsageError("--limit", error.what());
        }
}

// Options that GDAL's own programs write with one dash and two letters.
const char* LongForm(const char* word) {
    if (std::strcmp(word, "-co") == 0) return "--co";
    if (std::strcmp(word, "-of") == 0) return "--of";
    return word;
}

std::vector<std::string> Reversed(int count, char** words) {
    std::vector<std::string> arguments;
    for (int i = count - 1; i > 0; --i) arguments.emplace_back(LongForm(words[i]));
    return arguments;
}

std::string DidYouMean(const std::string& name) { return " (did you mean " + name + "?)"; }

void Program::CheckCommand(const std::string& word) const {
    if (word.empty() || word[0] == '-' || word == generate->get_name()) return;
    std::vector<std::string> names;
    for (const CLI::App* part : parts) names.push_back(part->get_name());
    if (std::find(names.begin(), names.end(), word) != names.end()) return;
    const std::string meant = Suggestion(word, names);
    throw UsageError(word, "there is no such command" + (meant.empty() ? "" : DidYouMean(meant)) +
                               "; see zmcraster --help");
}

// What an option was meant to be that a part of the command line does not have; empty if `word` is
// no option, or like none.
std::string MeantOption(const CLI::App& part, const std::string& word) {
    const std::size_t dashes = word.find_first_not_of('-');
    if (dashes == 0 || dashes == word.npos) return {};
    std::vector<std::string> names;
    for (const CLI::Option* option : part.get_options())
        for (const std::string& name : option->get_lnames()) names.push_back(name);
    const std::string bare = word.substr(dashes, word.find('=') - dashes);
    // "-json" lacks nothing but a dash.
    const bool dashed = dashes == 1 && std::find(names.begin(), names.end(), bare) != names.end();
    const std::string meant = dashed ? bare : Suggestion(bare, names);
    return meant.empty() ? meant : DidYouMean("--" + meant);
}

// The library tells words that nothing takes from the last to the first.
std::string Program::WhatIsWrong(const CLI::ParseError& error) const {
    if (!dynamic_cast<const CLI::ExtrasError*>(&error)) return error.what();
    std::vector<const CLI::App*> all = {&app};
    for (const CLI::App* part : app.get_subcommands()) all.push_back(part);
    std::string words, hint;
    std::size_t count = 0;
    for (const CLI::App* part : all)
        for (const std::string& word : part->remaining()) {
            words += ' ' + word;
            if (hint.empty()) hint = MeantOption(*part, word);
            ++count;
        }
    return (count == 1 ? "The following argument was not expected:"
                       : "The following arguments were not expected:") +
           words + hint;
}

ExitStatus Program::Run(std::vector<std::string> arguments) {
    if (!arguments.empty()) CheckCommand(arguments.back());
    try {
        app.parse(std::move(arguments));
    } catch (const CLI::ParseError& error) {
        // Help and version come as errors with the status 0.
        if (error.get_exit_code() == 0) return app.exit(error), ExitStatus::Done;
        std::string command;
        for (const CLI::App* part : app.get_subcommands()) command = ' ' + part->get_name();
        Say(WhatIsWrong(error) + "; see zmcraster" + command + " --help");
        return ExitStatus::Usage;
    }
    return RunChosen();
}

ExitStatus Guarded(int count, char** words) {
    try {
        return Program().Run(Reversed(count, words));
    } catch (const std::exception&) {
        const Answer answer = AnswerOfException();
        Say(answer.text);
        return answer.status;
    }
}

}  // namespace
}  // namespace zmctools

int main(int count, char** words) {
    if (!platform::HoldStandardStreams()) return static_cast<int>(zmctools::ExitStatus::Failed);
    return static_cast<int>(zmctools::Guarded(count, words));
}
