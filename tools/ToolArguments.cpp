#include "tools/ToolArguments.h"

#include <CLI/CLI.hpp>

std::optional<int> parseToolArguments(int argc, char** argv, const ToolArguments& arguments, std::string& folder,
                                      bool& flag)
{
    CLI::App app{arguments.description};
    CLI::Option* option = app.add_option("folder", folder, arguments.folderHelp);
    if (arguments.folderRequired)
        option->required();
    app.add_flag(arguments.flagName, flag, arguments.flagHelp);
    try {
        app.parse(argc, argv);
    } catch (const CLI::ParseError& e) {
        return app.exit(e);
    }
    return std::nullopt;
}
