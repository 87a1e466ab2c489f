// Shared plumbing of the kxacore command-line program: each area file
// (date.cpp, regex.cpp ...) adds its verbs to the app, and reports bad input
// by throwing KXACommandError, which main() prints to stderr as
// "kxacore: <message>" with exit status 1 (2 for usage errors, from CLI11).
#pragma once

#include <CLI/CLI.hpp>
#include <nlohmann/json.hpp>

#include <stdexcept>
#include <string>

struct KXACommandError : std::runtime_error {
  using std::runtime_error::runtime_error;
};

// Registration hooks, one per area; main.cpp calls them in order.
void registerDateCommands(CLI::App& app);
void registerRegexCommands(CLI::App& app);
void registerNameCommands(CLI::App& app);
void registerPlaceCommands(CLI::App& app);
void registerIniCommands(CLI::App& app);
void registerBinaryCommands(CLI::App& app);
void registerTextCommands(CLI::App& app);
void registerLogCommands(CLI::App& app);
void registerGedcomCommands(CLI::App& app);
void registerZipCommands(CLI::App& app);
void registerImageCommands(CLI::App& app);
void registerStoryCommands(CLI::App& app);
// Verb added under "zip" (registerZipCommands creates it).
void registerZipEditCommand(CLI::App& zipCommand);
// Verbs added under "date" (registerDateCommands creates it).
void registerDateParseCommand(CLI::App& dateCommand);
void registerDateFormatCommand(CLI::App& dateCommand);

// Prints one JSON object on its own line. Invalid UTF-8 in strings is
// replaced rather than thrown about, so hostile input cannot abort output.
void printJsonLine(const nlohmann::ordered_json& object);
