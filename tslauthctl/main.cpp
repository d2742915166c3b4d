// SPDX-License-Identifier: Apache-2.0
#include "Host.h"
#include "Verbs.h"

#if defined(__GNUC__)
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wshadow"
#endif
#include <CLI/CLI.hpp>
#if defined(__GNUC__)
#pragma GCC diagnostic pop
#endif

#include <cstring>
#include <functional>
#include <iostream>

namespace {

using namespace tessel::tslauthctl;

constexpr char footer[] = R"(Exit codes:
  0  done
  1  failed, for instance because the output or the lock cannot be written
  2  wrong usage, or a store that is not known
  3  must be run as root
  4  refused by the library; its message is shown
  5  would lose something; nothing was changed
  6  the host is not in step with the recorded store (status)
  7  there is something to change (plan, prepare)
)";

struct Arguments {
    bool json = false;
    Colour colour = Colour::automatic;
    std::string store;
    bool acceptLoss = false;
    bool write = false;
};

/// Parses, or says how the process ends without a command.
class Parser {
public:
    explicit Parser(Arguments& arguments)
        : _app("Activate and inspect the authentication store of this host.", "tslauthctl") {
        _app.set_version_flag("--version", "tslauthctl " TSLAUTH_VERSION);
        _app.require_subcommand(1);
        _app.footer(footer);
        AddCommon(_app, arguments);

        Add("stores", "List the stores; the active one has a star", arguments,
            [](Output& output) { return RunStores(output); });
        Add("status", "Say which store is recorded and whether the host agrees with it", arguments,
            [](Output& output) { return RunStatus(output); });

        auto* plan = Add("plan", "Show what 'activate' would write, and change nothing", arguments,
                         [&](Output& output) { return RunPlan(arguments.store, output); });
        plan->add_option("store", arguments.store, "Display name of a store")
            ->required()
            ->type_name("NAME");

        auto* activate =
            Add("activate", "Make a store the active one", arguments, [&](Output& output) {
                return RunActivate(arguments.store, arguments.acceptLoss, output);
            });
        activate->add_option("store", arguments.store, "Display name of a store")
            ->required()
            ->type_name("NAME");
        activate->add_flag("--accept-loss", arguments.acceptLoss,
                           "Also where the files lose what the library cannot carry");

        auto* prepare =
            Add("prepare", "Show the smallest edit that lets the library carry the files",
                arguments, [&](Output& output) {
                    return RunPrepare(arguments.write, arguments.acceptLoss, output);
                });
        prepare->add_flag("--write", arguments.write, "Make the edit; the original is kept beside");
        prepare->add_flag("--accept-loss", arguments.acceptLoss,
                          "Also edit lines that cannot keep their whole meaning");
    }

    /// @return the command to run; empty where `exitCode` is how it ends
    std::function<ExitCode(Output&)> Parse(int argc, char** argv, int& exitCode,
                                           std::string& error) {
        try {
            _app.parse(argc, argv);
        } catch (CLI::Success const& e) {
            exitCode = _app.exit(e);
            std::cout.flush();
            if (!std::cout) {
                exitCode = static_cast<int>(ExitCode::failure);
            }
            return {};
        } catch (CLI::ParseError const& e) {
            exitCode = static_cast<int>(ExitCode::usage);
            error = std::string(e.what()) + " (see tslauthctl --help)";
            return {};
        }
        return _run;
    }

    std::string Command() const {
        auto const chosen = _app.get_subcommands();
        return chosen.empty() ? std::string() : chosen.front()->get_name();
    }

private:
    static void AddCommon(CLI::App& app, Arguments& arguments) {
        app.add_flag("--json", arguments.json, "Write one JSON document (schema version 1)");
        app.add_option("--color", arguments.colour, "When to use colours: auto, always or never")
            ->type_name("WHEN")
            ->transform(
                CLI::CheckedTransformer(std::map<std::string, Colour>{{"auto", Colour::automatic},
                                                                      {"always", Colour::always},
                                                                      {"never", Colour::never}},
                                        CLI::ignore_case))
            ->option_text("WHEN");
    }

    CLI::App* Add(char const* name, char const* description, Arguments& arguments,
                  std::function<ExitCode(Output&)> run) {
        auto* command = _app.add_subcommand(name, description);
        command->footer(footer);
        AddCommon(*command, arguments);
        command->callback([this, run = std::move(run)] { _run = run; });
        return command;
    }

    CLI::App _app;
    std::function<ExitCode(Output&)> _run;
};

/// Also where the arguments cannot be parsed.
bool AsksForJson(int argc, char** argv) {
    for (int i = 1; i < argc; ++i) {
        if (std::strcmp(argv[i], "--json") == 0) {
            return true;
        }
    }
    return false;
}

int Run(int argc, char** argv) {
    Arguments arguments;
    Parser parser(arguments);
    int exitCode = 0;
    std::string error;
    auto const run = parser.Parse(argc, argv, exitCode, error);
    Output output(arguments.json || AsksForJson(argc, argv), arguments.colour);
    auto const command = parser.Command();
    output.Document()["command"] = nullptr;
    if (!command.empty()) {
        output.Document()["command"] = command;
    }
    output.Document()["error"] = nullptr;
    if (!run) {
        if (exitCode == 0) {
            return 0;
        }
        output.Error(Failure(ExitCode::usage, error));
        return output.Finish(static_cast<ExitCode>(exitCode));
    }
    try {
        return output.Finish(run(output));
    } catch (Failure const& e) {
        output.Error(e);
        return output.Finish(e.Code());
    } catch (std::bad_alloc const& e) {
        output.Error(Failure(ExitCode::failure, e.what()));
        return output.Finish(ExitCode::failure);
    } catch (std::exception const& e) {
        output.Error(Refused(e));
        return output.Finish(ExitCode::refused);
    }
}

} // namespace

int main(int argc, char** argv) {
    try {
        return Run(argc, argv);
    } catch (std::exception const& e) {
        std::cerr << "tslauthctl: " << e.what() << '\n';
        return static_cast<int>(ExitCode::failure);
    }
}
