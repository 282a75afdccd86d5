// SPDX-License-Identifier: BSD-2-Clause
#include "common/command_line.h"

#include <algorithm>
#include <string>
#include <vector>

#include "common/files.h"
#include "common/near_miss.h"

namespace tools {
namespace {

using Words = std::vector<std::string>;

std::vector<const CLI::App *> commands_of(const CLI::App &app) {
  return app.get_subcommands([](const CLI::App *) { return true; });
}

const CLI::App *find_command(const CLI::App &app, const std::string &name) {
  const std::vector<const CLI::App *> commands = commands_of(app);
  const auto found = std::ranges::find(commands, name, &CLI::App::get_name);
  return found == commands.end() ? nullptr : *found;
}

/// Whether the option, of any command, is followed by a value.
bool takes_value(const CLI::App &app, const std::string &option) {
  for (const CLI::Option *known : app.get_options()) {
    if (known->check_name(option)) return known->get_items_expected_max() > 0;
  }
  return std::ranges::any_of(
      commands_of(app), [&](const CLI::App *command) { return takes_value(*command, option); });
}

/// The same words with the commands first, where each of them knows all the options behind it.
Words commands_first(const CLI::App &app, std::span<char *> words) {
  Words commands, options;
  const CLI::App *level = &app;
  size_t i = 1;
  for (; i < words.size(); ++i) {
    const std::string word = words[i];
    const CLI::App *command = find_command(*level, word);
    if (command != nullptr) {
      commands.push_back(word);
      level = command;
    } else if (word.size() > 1 && word.front() == '-' && word != "--") {
      options.push_back(word);
      if (takes_value(app, word) && i + 1 < words.size()) options.emplace_back(words[++i]);
    } else {
      break;
    }
  }
  commands.insert(commands.end(), options.begin(), options.end());
  commands.insert(commands.end(), words.begin() + static_cast<std::ptrdiff_t>(i), words.end());
  return commands;
}

/// What the words of a command line have named so far, outermost first.
std::vector<const CLI::App *> named_commands(const CLI::App &app) {
  std::vector<const CLI::App *> named = {&app};
  while (!named.back()->get_subcommands().empty()) {
    named.push_back(named.back()->get_subcommands().front());
  }
  return named;
}

/// The words that could have stood in place of `word`.
Words candidates(const CLI::App &app, bool is_option) {
  const std::vector<const CLI::App *> named = named_commands(app);
  Words names;
  if (!is_option) {
    for (const CLI::App *command : commands_of(*named.back())) names.push_back(command->get_name());
    return names;
  }
  for (const CLI::App *level : named) {
    for (const CLI::Option *option : level->get_options()) {
      for (const std::string &name : option->get_lnames()) names.push_back("--" + name);
    }
  }
  return names;
}

std::string listed(const Words &words) {
  std::string list;
  for (const std::string &word : words) list += (list.empty() ? "" : ", ") + word;
  return list;
}

std::string unknown_text(const CLI::App &app, const std::string &word) {
  const bool is_option = word.starts_with('-');
  const Words names = candidates(app, is_option);
  if (names.empty()) return "\"" + word + "\" is not expected here";
  const std::string unknown =
      (is_option ? "unknown option \"" : "unknown command \"") + word + "\": ";
  return unknown + suggestion(word, names,
                              std::string("expected ") +
                                  (is_option ? "one of those in the help" : listed(names)));
}

/// A word that has no place says more than what is missing because of it.
std::string usage_text(const CLI::App &app, const CLI::ParseError &error) {
  const Words unknown = app.remaining(true);
  const Words commands = candidates(app, false);
  const std::string text = !unknown.empty() ? unknown_text(app, unknown.front())
                           : error.get_name() == "RequiredError" && !commands.empty()
                               ? "expected a command: " + listed(commands)
                               : error.what();
  return text + " (--help tells more)";
}

}  // namespace

bool parse_command_line(CLI::App &app, std::span<char *> words) {
  try {
    if (words.size() < 2) throw CLI::CallForHelp();
    Words ordered = commands_first(app, words);
    std::ranges::reverse(ordered);  // as CLI11 wants them
    app.parse(std::move(ordered));
    return true;
  } catch (const CLI::CallForHelp &) {
    write_file("-", app.help());
  } catch (const CLI::CallForVersion &version) {
    write_file("-", std::string(version.what()) + "\n");
  } catch (const CLI::ParseError &error) {
    throw UsageError(usage_text(app, error));
  }
  return false;
}

}  // namespace tools
