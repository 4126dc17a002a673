#include "tools/console/command_model.h"

#include <CLI/CLI.hpp>
#include <sstream>

namespace tavrel {
namespace {

std::vector<std::string> namesOf(const CLI::Option& option) {
  std::vector<std::string> names;
  for (const std::string& name : option.get_snames())
    names.push_back("-" + name);
  for (const std::string& name : option.get_lnames())
    names.push_back("--" + name);
  return names;
}

// CLI11's "TEXT:{a,b}" for a value that is one of a few; otherwise a plain name.
void readType(const std::string& type, OptionModel& model) {
  const std::size_t brace = type.find(":{");
  if (brace == std::string::npos || !type.ends_with('}')) {
    model.value = type;
    return;
  }
  model.value = type.substr(0, brace);
  std::istringstream list(type.substr(brace + 2, type.size() - brace - 3));
  for (std::string choice; std::getline(list, choice, ',');)
    model.choices.push_back(choice);
}

OptionModel modelOf(const CLI::Option& option) {
  OptionModel model;
  model.names = namesOf(option);
  if (model.names.empty()) {
    readType(option.get_type_name(), model);
    model.value = option.get_name(true);
  } else if (option.get_items_expected_max() > 0) {
    readType(option.get_type_name(), model);
  }
  model.description = option.get_description();
  model.isRequired = option.get_required();
  model.mayRepeat = option.get_items_expected_max() > 1;
  for (const CLI::Option* other : option.get_excludes())
    model.excludes.push_back(namesOf(*other).back());
  return model;
}

void addOptions(const CLI::App& app, CommandModel& model) {
  for (const CLI::Option* const option : app.get_options()) {
    if (option == app.get_help_ptr()) continue;
    OptionModel made = modelOf(*option);
    (made.names.empty() ? model.arguments : model.options).push_back(std::move(made));
  }
}

// Each option of a choice excludes all the others.
void addChoice(const CLI::App& choice, CommandModel& model) {
  const std::size_t first = model.options.size();
  addOptions(choice, model);
  for (std::size_t i = first; i < model.options.size(); ++i) {
    for (std::size_t j = first; j < model.options.size(); ++j) {
      if (i != j) model.options[i].excludes.push_back(model.options[j].name());
    }
  }
}

CommandModel modelOf(const CLI::App& app, const std::string& parents) {
  CommandModel model;
  model.name = app.get_name();
  model.path = parents.empty() ? model.name : parents + ' ' + model.name;
  model.description = app.get_description();
  addOptions(app, model);
  for (const CLI::App* const below : app.get_subcommands([](const CLI::App*) { return true; })) {
    if (below->get_name().empty()) {
      addChoice(*below, model);
    } else if (!below->get_group().empty()) {
      model.commands.push_back(modelOf(*below, model.path));
    }
  }
  return model;
}

// Removes the program's own name from the paths.
void dropProgram(CommandModel& model, std::size_t size) {
  model.path.erase(0, std::min(size, model.path.size()));
  for (CommandModel& below : model.commands)
    dropProgram(below, size);
}

}  // namespace

CommandModel modelOf(const Command& program) {
  CommandModel model = modelOf(*program.app_, {});
  dropProgram(model, model.name.size() + 1);
  return model;
}

}  // namespace tavrel
