#include <set>

#include "command_line/command_table.h"
#include "command_line/documents.h"

namespace oauthctl {
namespace {

std::string firstWord(const std::string& path) { return path.substr(0, path.find(' ')); }

std::string optionsOf(const Command& command) {
  std::string words;
  for (const Option& option : command.options) words.append(option.name).append(" ");
  return words + "--help";
}

bool takesFile(const Command& command) {
  return !command.operands.empty() && command.operands.front().isFile;
}

// The words that can follow this one: "list show add ..." after "client".
std::string nextWords(const std::string& word) {
  std::string words;
  for (const Command& command : commandTable()) {
    const std::string path = command.path;
    if (path.rfind(word + " ", 0) == 0) words += path.substr(word.size() + 1) + " ";
  }
  return words;
}

std::set<std::string> firstWords() {
  std::set<std::string> words;
  for (const Command& command : commandTable()) words.insert(firstWord(command.path));
  return words;
}

std::string joined(const std::set<std::string>& words, const std::string& separator) {
  std::string text;
  for (const std::string& word : words) text += (text.empty() ? "" : separator) + word;
  return text;
}

// Every command and every first word of one, in the form that the loop in the script compares.
std::string knownPaths() {
  std::set<std::string> paths;
  for (const std::string& word : firstWords()) paths.insert("' " + word + "'");
  for (const Command& command : commandTable())
    if (std::string(command.path).find(' ') != std::string::npos)
      paths.insert("'" + std::string(command.path) + "'");
  return joined(paths, " | ");
}

std::string optionsWithValue() {
  std::set<std::string> names;
  for (const Command& command : commandTable())
    for (const Option& option : command.options)
      if (option.value != nullptr) names.insert(option.name);
  return joined(names, " | ");
}

std::string wordsByPath() {
  std::string cases = "    '') words='" + joined(firstWords(), " ") + " --help --version' ;;\n";
  for (const Group& group : commandGroups())
    cases +=
        std::string("    '") + group.word + "') words='" + nextWords(group.word) + "--help' ;;\n";
  for (const Command& command : commandTable())
    cases += std::string("    '") + command.path + "') words='" + nextWords(command.path) +
             optionsOf(command) + "'" + (takesFile(command) ? " files=yes" : "") + " ;;\n";
  return cases;
}

}  // namespace

std::string bashCompletion() {
  return R"(# Completion of oauthctl for bash: source it, or install it as
# /usr/share/bash-completion/completions/oauthctl. Made from the program's table of commands.
# shellcheck shell=bash

_oauthctl() {
  local current=${COMP_WORDS[COMP_CWORD]} path='' words='' files='' word
  COMPREPLY=()
  case ${COMP_WORDS[COMP_CWORD - 1]} in
    )" + optionsWithValue() +
         R"() return ;;
  esac
  for word in "${COMP_WORDS[@]:1:COMP_CWORD-1}"; do
    case "$path $word" in
      )" +
         knownPaths() +
         R"()
        path=${path:+$path }$word
        ;;
    esac
  done
  case $path in
)" + wordsByPath() +
         R"(  esac
  mapfile -t COMPREPLY < <(compgen -W "$words" -- "$current")
  if [[ -n $files && $current != -* ]]; then
    compopt -o filenames 2>/dev/null
    mapfile -t COMPREPLY < <(compgen -f -- "$current")
  fi
}

complete -F _oauthctl oauthctl
)";
}

}  // namespace oauthctl
