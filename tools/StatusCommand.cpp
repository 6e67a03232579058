#include <cstdio>

#include "tools/Command.h"
#include "tools/PlannedBuild.h"

namespace zmctools {
namespace {

class StatusCommand final : public Command {
public:
    const char* Name() const override { return "status"; }
    const char* Summary() const override {
        return "Tell which parts of a planned pyramid are done";
    }
    void Describe(OptionTable& table) override;
    ExitStatus Run() override;

private:
    std::string file;

    void Print(const PyramidPlan& plan, const std::vector<std::uint64_t>& missing,
               std::uint64_t counted) const;
};

void StatusCommand::Describe(OptionTable& table) {
    table.Text("PLAN", file, "File that plan has made").Required();
    table.Footer(
        "Examples:\n"
        "  zmcraster status scene.pyr.zmcplan\n"
        "  zmcraster status scene.pyr.zmcplan --json | jq -r '.missing[]'\n"
        "\n"
        "A part is done when it has a record that is whole and of this plan. The source is not "
        "looked\nat.");
}

void StatusCommand::Print(const PyramidPlan& plan, const std::vector<std::uint64_t>& missing,
                          std::uint64_t counted) const {
    const std::uint64_t parts = plan.grid.Count();
    if (json) {
        PrintDocument({{"schema", kSchema},
                       {"plan", plan.path},
                       {"source", plan.words.source},
                       {"target", plan.words.target},
                       {"parts", parts},
                       {"done", parts - missing.size()},
                       {"counted", counted},
                       {"missing", missing}});
        return;
    }
    std::printf("%s: %llu of %llu parts done%s%s\n", Visible(plan.words.target).c_str(),
                static_cast<unsigned long long>(parts - missing.size()),
                static_cast<unsigned long long>(parts), missing.empty() ? "" : ", missing ",
                PartList(missing).c_str());
}

ExitStatus StatusCommand::Run() {
    const PyramidPlan plan = PyramidPlan::Read(file);
    plan.CheckFile();
    const zmchost::PartFolder records = plan.Records();
    std::vector<std::uint64_t> missing;
    std::uint64_t counted = 0;
    for (std::uint64_t part = 0; part < plan.grid.Count(); ++part) {
        if (!records.Find(zmchost::PartFolder::Kind::Part, part)) missing.push_back(part);
        if (records.Find(zmchost::PartFolder::Kind::Count, part)) ++counted;
    }
    Print(plan, missing, counted);
    return ExitStatus::Done;
}

}  // namespace

std::unique_ptr<Command> MakeStatusCommand() { return std::make_unique<StatusCommand>(); }

}  // namespace zmctools
