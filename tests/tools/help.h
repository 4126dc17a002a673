// What the tool says about its own commands.
#pragma once

#include <set>

#include "device.h"

namespace tavrel {

using Words = std::set<std::string>;

/// The commands and options that the help of `path` lists.
struct Help {
  Words commands, options;

  Help(const TemporaryDevice& device, const std::string& path) {
    std::istringstream lines(device.run(path + " --help").out);
    bool isOfCommands = false;
    for (std::string line; std::getline(lines, line);) {
      if (!line.starts_with(' ')) isOfCommands = line == "Subcommands:";
      std::istringstream words(line);
      std::string word;
      words >> word;
      // Lines that are indented further are only descriptions.
      if (!line.starts_with("  ") || line.find_first_not_of(' ') > 6) continue;
      if (isOfCommands) commands.insert(word);
      for (std::istringstream names(word); std::getline(names, word, ',');)
        if (word.starts_with('-') && word != "-h") options.insert(word);
    }
  }
};

}  // namespace tavrel
