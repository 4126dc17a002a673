// The words of commands.
#pragma once

#include <initializer_list>
#include <sstream>
#include <string>
#include <vector>

namespace tavrel {

/// The words of a command; may be given as one text if no word is empty or contains spaces.
struct CommandLine : std::vector<std::string> {
  CommandLine(std::initializer_list<std::string> words) : vector(words) {}
  CommandLine(std::vector<std::string> words) : vector(std::move(words)) {}
  CommandLine(const std::string& text) {
    std::istringstream words(text);
    for (std::string word; words >> word;)
      push_back(word);
  }
  CommandLine(const char* text) : CommandLine(std::string(text)) {}

  CommandLine with(const std::string& word) const {
    CommandLine longer = *this;
    longer.push_back(word);
    return longer;
  }
};

}  // namespace tavrel
