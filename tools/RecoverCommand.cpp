#include <cstdio>

#include "host/file/MetadataDocument.h"
#include "host/journal/MetadataJournal.h"
#include "tools/Command.h"
#include "tools/RasterView.h"

namespace zmctools {
namespace {

using Outcome = zmchost::Recovery::Outcome;

class RecoverCommand final : public Command {
public:
    const char* Name() const override { return "recover"; }
    const char* Summary() const override {
        return "Put statistics in order whose store was cut off";
    }
    void Describe(OptionTable& table) override;
    ExitStatus Run() override;

private:
    std::string file;
    bool discard = false;

    void Report(const char* result, const std::string& text) const;
    void Recover() const;
    void Discard() const;
};

void RecoverCommand::Describe(OptionTable& table) {
    table.Text("FILE", file, "Pyramid to put in order").Required();
    table.Flag("--discard", discard,
               "Remove statistics, histograms and palettes that are damaged and of which there "
               "is no copy, so that new ones can be stored");
    table.Footer(
        "Examples:\n"
        "  zmcraster recover scene.pyr\n"
        "  zmcraster recover scene.pyr --discard\n"
        "\n"
        "A host may keep a copy of the metadata document in FILE.zmcmeta while it stores into it. "
        "A\n"
        "copy that is left over is put back, or removed where the store is whole. Pixels are not\n"
        "touched. Other commands write nothing into FILE; they warn of a copy that is left over.");
}

void RecoverCommand::Report(const char* result, const std::string& text) const {
    if (json)
        PrintDocument({{"schema", kSchema}, {"file", file}, {"result", result}, {"text", text}});
    else if (!quiet)
        std::printf("%s: %s\n", Visible(file).c_str(), Visible(text).c_str());
}

void RecoverCommand::Recover() const {
    const zmchost::Recovery recovery = zmchost::RecoverMetadata(file);
    switch (recovery.outcome) {
        case Outcome::Restored:
            return Report("restored", recovery.text);
        case Outcome::Complete:
            return Report("complete", recovery.text);
        case Outcome::UnderWay:
            throw Failure(file, "another process is storing into it");
        case Outcome::Unusable:
            throw Failure(file, recovery.text + "; --discard removes it");
        case Outcome::Failed:
            throw Failure(file, recovery.text);
        case Outcome::Nothing:
        case Outcome::Pending:
            break;
    }
    const std::string wrong = zmchost::JudgeMetadata(file, zmchost::PyramidHeader::Read(file));
    if (!wrong.empty())
        throw Failure(file, wrong +
                                ", and there is no copy of the one before; --discard removes "
                                "it");
    Report("nothing", "there is nothing to recover");
}

void RecoverCommand::Discard() const {
    // A copy that can be put back is not discarded, and one of a store that is whole not needed.
    zmchost::DiscardMetadata(file);
    Report("discarded", "what was damaged is removed; statistics can be stored anew");
}

ExitStatus RecoverCommand::Run() {
    RefuseElsewhere(file, "only files in plain folders are put in order");
    CheckIsFile(file);
    discard ? Discard() : Recover();
    return ExitStatus::Done;
}

}  // namespace

std::unique_ptr<Command> MakeRecoverCommand() { return std::make_unique<RecoverCommand>(); }

}  // namespace zmctools
