// Command: one of the things that zmcraster does. Help, man page and completion are all made from
// what Describe tells.
#ifndef ZMC_TOOLS_COMMAND_H
#define ZMC_TOOLS_COMMAND_H

#include <memory>
#include <vector>

#include "describe/Description.h"
#include "describe/JsonNumbers.h"
#include "tools/Message.h"
#include "tools/OptionTable.h"

namespace zmctools {

using zmcdescribe::Json;
using zmcdescribe::JsonNumber;
using zmcdescribe::kSchema;

class Command {
public:
    virtual ~Command() = default;

    // Adds the command's options to its part of the command line. The footer holds its examples.
    virtual void Describe(OptionTable& table) = 0;
    // Does it. Throws Failure, UsageError, Interruption or what the libraries throw.
    virtual ExitStatus Run() = 0;

    virtual const char* Name() const = 0;
    virtual const char* Summary() const = 0;

    bool json = false;
    bool quiet = false;

protected:
    // Writes a document to stdout. Throws Failure if it cannot be written.
    static void PrintDocument(const Json& document);
};

std::unique_ptr<Command> MakeBuildCommand();
std::unique_ptr<Command> MakeInfoCommand();
std::unique_ptr<Command> MakeExportCommand();
std::unique_ptr<Command> MakeHashCommand();
std::unique_ptr<Command> MakeVerifyCommand();
std::unique_ptr<Command> MakeCompareCommand();
std::unique_ptr<Command> MakePreviewCommand();
std::unique_ptr<Command> MakeServeCommand();
std::unique_ptr<Command> MakeStatsCommand();
std::unique_ptr<Command> MakeRecoverCommand();
std::unique_ptr<Command> MakePlanCommand();
std::unique_ptr<Command> MakePartCommand();
std::unique_ptr<Command> MakeFinishCommand();
std::unique_ptr<Command> MakeStatusCommand();
std::unique_ptr<Command> MakeUpdateCommand();

}  // namespace zmctools

#endif
