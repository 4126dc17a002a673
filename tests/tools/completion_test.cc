// Completions and the manual page, which are generated from the tool's commands.
#include "help.h"

namespace tavrel {
namespace {

/// What bash completes at the end of a command line, with the built tool in PATH. Like bash, the
/// script splits words at colons and equals signs.
Words completeInBash(const TemporaryDevice& device, const std::string& line) {
  device.write("/line.bash",
               "export PATH=" TAVREL_BUILD "/bin:$PATH TAVREL_ROOT=" + device.path("") +
                   "\nsource " TAVREL_BUILD
                   "/completions/bash/tavrelctl\n"
                   "COMP_LINE='tavrelctl " +
                   line +
                   "'\n"
                   "COMP_WORDS=($(sed 's/[:=]\\+/ & /g' <<< \"$COMP_LINE\"))\n"
                   "[[ $COMP_LINE != *' ' ]] || COMP_WORDS+=('')\n"
                   "COMP_CWORD=$((${#COMP_WORDS[@]} - 1))\n_tavrelctl\n"
                   "printf '%s\\n' \"${COMPREPLY[@]}\"\n");
  const std::string command =
      "LC_ALL=C bash " + device.path("/line.bash") + " > " + device.path("/words") + " 2>&1";
  EXPECT_EQ(std::system(command.c_str()), 0);
  std::istringstream list(contentOf(device.path("/words")));
  Words words;
  for (std::string word; std::getline(list, word);)
    if (!word.empty()) words.insert(word);
  return words;
}

void expectAll(const TemporaryDevice& device, const std::string& path, int& commands) {
  const Help help(device, path);
  ++commands;
  Words offered = completeInBash(device, path + " -");
  EXPECT_TRUE(offered.erase("--root")) << path;
  Words options = help.options;
  options.erase("--root");
  EXPECT_EQ(offered, options) << path;
  if (!help.commands.empty()) {
    EXPECT_EQ(completeInBash(device, path + " "), help.commands);
    for (const std::string& command : help.commands)
      expectAll(device, path.empty() ? command : path + " " + command, commands);
    return;
  }
  // The manual page has the usage, with each option in it.
  const std::string page = contentOf(TAVREL_BUILD "/man/tavrelctl.1");
  const std::size_t at = page.find("\n\\fB" + path);
  ASSERT_NE(at, page.npos) << path;
  const std::string usage = page.substr(at, page.find('\n', at + 1) - at);
  for (std::string option : options) {
    if (option.size() == 2 || option == "--help") continue;
    for (std::size_t dash = 0; (dash = option.find('-', dash)) != option.npos; dash += 2)
      option.insert(dash, 1, '\\');
    EXPECT_NE(usage.find("\\fB" + option + "\\fR"), usage.npos) << path << ' ' << option;
  }
}

using CompletionTest = DeviceTest;

TEST_F(CompletionTest, HasEveryCommandAndOption) {
  int commands = 0, shells = 0;
  expectAll(device, "", commands);
  EXPECT_GE(commands, 60);
  for (const char* const shell : {"zsh", "fish"}) {
    const std::string script = device.run(std::string("completion ") + shell).out;
    expectIn(script, {"manufacturer-id"});
    const std::string has = std::string("command -v ") + shell + " > /dev/null";
    const std::string parses =
        std::string(shell) + " -n " TAVREL_BUILD "/completions/" + shell + "/*tavrelctl*";
    if (std::system(has.c_str()) != 0) continue;
    EXPECT_EQ(std::system(parses.c_str()), 0) << shell;
    ++shells;
  }
  expectIn(device.run("completion zsh").out,
           {"'(--root)--root=[Folder that holds", "--day=[",
            "'(--bool --string --int --float --date --plist)--bool[true, yes"});
  expectIn(device.run("completion catalogue").out, {"\ncom.norvane.usage.processes\n"});
  EXPECT_EQ(device.run("--help").out.find("completion"), std::string::npos);
  if (shells == 0) GTEST_SKIP() << "neither fish nor zsh: their syntax is not checked";
}

TEST_F(CompletionTest, CompletesValues) {
  device.run("stat import -",
             "scalar\ttoday\tcom.example.a\t1\nvalue\tyesterday\tcom.example.b\t1\t"
             "1\nscalar\ttoday\tcom.$(touch x)\t1\nscalar\t20000\tcom.old\t1\n"
             "scalar\ttoday\t-n\t1\n");
  device.run("prefs set com.example.domain k v");
  device.fileLog("pending/log-tallied-20261127T180218Z-5f0c9a1e", "x", "{}");
  device.write("/folder/file.log", "");
  const std::pair<std::string, Words> kCases[] = {
      {"stat show ", {"com.example.a", "com.example.b"}},
      {"stat show com.", {"com.example.a", "com.example.b"}},
      {"whitelist explain x y com.example.a", {"com.example.a"}},
      {"stat show com.example.a com.", {}},
      {"plist convert --to ", {"xml", "binary", "json"}},
      {"prefs get com.", {"com.example.domain"}},
      {"prefs get com.example.domain ", {}},
      {"log show log", {"log-tallied-20261127T180218Z-5f0c9a1e"}},
      {"log show " + device.path("/folder/f"), {device.path("/folder/file.log")}},
      {"whitelist diff " + device.path("/folder/f"), {device.path("/folder/file.log")}},
      {"whitelist diff x " + device.path("/folder/f"), {device.path("/folder/file.log")}},
      {"--root " + device.path("/fol"), {device.path("/folder")}},
      {"--root=" + device.path("/fol"), {device.path("/folder")}},
      {"--root=" + device.path("/folder") + " stat show com", {}},
      {"plist convert --to=", {"xml", "binary", "json"}},
      {"log preview --day t", {"today"}}};
  for (const auto& [line, words] : kCases)
    EXPECT_EQ(completeInBash(device, line), words) << line;
  EXPECT_EQ(completeInBash(device, "stat list --day 2").size(), 31U);
}

TEST_F(CompletionTest, MakesThePageOfATemplate) {
  const std::string file = device.path("/page.in");
  device.write("/page.in",
               ".SH COMMANDS\n@command send force\n@command send deliver\nProse.\n"
               "@command plist convert\nMore.\n@others The rest\n.SH END\n");
  const Outcome page = device.run("completion man " + file);
  EXPECT_TRUE(page.out.starts_with(
      ".SH COMMANDS\n.TP\n\\fBsend force\\fR \\fIDAY\\fR\n.TQ\n\\fBsend deliver\\fR \\fIFILE\\fR\n"
      "Prose.\n.TP\n\\fBplist convert\\fR [\\fB\\-\\-to\\fR \\fBxml\\fR|\\fBbinary\\fR|"
      "\\fBjson\\fR] [\\fB\\-\\-output\\fR \\fIFILE\\fR] \\fIFILE\\fR\nMore.\n.RS\n.TP\n"
      "\\fB\\-\\-to\\fR \\fBxml\\fR|\\fBbinary\\fR|\\fBjson\\fR\nThe form to write.\n.TP\n"
      "\\fB\\-o\\fR, \\fB\\-\\-output\\fR \\fIFILE\\fR\nFile to write, in one step; \\- is "
      "standard output.\n.RE\n.SS The rest\n.TP\n\\fBstatus\\fR"))
      << page;
  EXPECT_TRUE(page.out.ends_with(".SH END\n")) << page;
  device.write("/page.in", "@command frob\n");
  device.check("completion man " + file,
               fails(file + ": there is no command 'frob': correct the template"));
}

}  // namespace
}  // namespace tavrel
