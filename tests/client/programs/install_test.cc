#include "recording.h"

namespace tavrel {
namespace {

TEST_F(Recording, InstalledFilesBuildTheExamples) {
  const std::string to = root / "installed";
  const std::string examples = TAVREL_EXAMPLES "/record";
  for (const char* component : {"libbrimhold1", "libbrimhold-dev", "python3-brimhold"})
    outputOf("cmake --install " TAVREL_BUILD " --prefix " + to + " --component " + component);
  const std::string pc = outputOf("find " + to + " -name brimhold.pc");
  const std::string lib = std::filesystem::path(pc).parent_path().parent_path();
  std::string flags =
      outputOf("PKG_CONFIG_PATH=" + lib + "/pkgconfig pkg-config --cflags --libs brimhold");
  flags.pop_back();
  flags += " -Wall -Wextra -Wpedantic -Werror " TAVREL_LINK_FLAGS;
  outputOf("cc -std=c11 " + examples + "/record.c -o " + to + "/c " + flags);
  outputOf("c++ -std=c++20 " + examples + "/record.cc -o " + to + "/cpp " + flags);
  outputOf("cmake -G Ninja -S " + examples + " -B " + to + "/build -DCMAKE_PREFIX_PATH=" + to +
           " -DCMAKE_EXE_LINKER_FLAGS='" TAVREL_LINK_FLAGS "' && cmake --build " + to + "/build");
  for (const char* program : {"/c", "/cpp", "/build/record", "/build/record_cpp"})
    EXPECT_EQ(outputOf("LD_LIBRARY_PATH=" + lib + " " + to + program), "");
  EXPECT_EQ(outputOf("PATH=" TAVREL_BUILD "/bin:$PATH " + examples + "/record.sh"), "");
  const std::string module = outputOf("find " + to + " -name brimhold.py");
  const std::string modules = std::filesystem::path(module).parent_path();
  EXPECT_EQ(outputOf(kPython + "LD_LIBRARY_PATH=" + lib + " PYTHONPATH=" + modules + " " +
                     examples + "/record.py"),
            "");

  testClock().realtime = 0;
  fold();
  ASSERT_EQ(scalars.size(), 1U);
  EXPECT_EQ(scalars.begin()->first.first, "com.example.starts");
  EXPECT_EQ(scalars.begin()->second, 6);
  EXPECT_EQ(records["com.example.seconds"], std::vector<double>(6, 2.5));

  const std::string library = lib + "/libbrimhold.so.1";
  EXPECT_EQ(
      outputOf("nm -D --defined-only " + library + " | grep -cv ' T BHClient.*@@BRIMHOLD_1.0$'"),
      "1\n");  // the name of the version
  EXPECT_EQ(outputOf("readelf -d " + library + " | grep -c 'libstdc++\\|libm\\.\\|libgcc' || true"),
            "0\n");
}

TEST_F(Recording, ProgramsOfAnotherCLibraryRecord) {
  if (std::system("command -v musl-gcc >/dev/null") != 0) GTEST_SKIP() << "no musl-gcc";
  const std::string to = root / "musl";
  // musl does not include the kernel's headers.
  outputOf("mkdir " + to + " && ln -s /usr/include/linux /usr/include/asm-generic " + to +
           " && ln -s /usr/include/$(cc -print-multiarch)/asm " + to);
  outputOf(
      "musl-gcc -static -std=c11 -Wall -Wextra -Wpedantic -Werror -D_GNU_SOURCE"
      " -DBRIMHOLD_BUILD_DAY=20000 -isystem " +
      to +
      " -I " TAVREL_SOURCE "/client/include " TAVREL_SOURCE "/client/*.c " TAVREL_EXAMPLES
      "/record/record.c -o " +
      to + "/record");
  EXPECT_EQ(outputOf(to + "/record && " + to + "/record"), "");
  testClock().realtime = 0;
  fold();
  ASSERT_EQ(scalars.size(), 1U);
  EXPECT_EQ(scalars.begin()->second, 2);
  EXPECT_EQ(records["com.example.seconds"], std::vector<double>(2, 2.5));
  EXPECT_TRUE(segments().empty());
}

TEST_F(Recording, InstalledUnitsNameTheirPrograms) {
  const std::string to = root / "elsewhere";
  outputOf("DESTDIR=" + to +
           " cmake --install " TAVREL_BUILD " --prefix /opt/x --component tavrel-statsd");
  const std::string unit = to + "/opt/x/lib/systemd/system/tavrel-statsd.service";
  const std::string program = "/opt/x/sbin/tavrel-statsd";
  EXPECT_EQ(outputOf("grep ^ExecStart= " + unit), "ExecStart=" + program + "\n");
  EXPECT_EQ(outputOf(to + program + " --version"),
            outputOf(TAVREL_BUILD "/bin/tavrel-statsd --version"));
}

TEST_F(Recording, InstalledDocumentsFindEachOther) {
  const std::string to = root / "documents";
  outputOf("cmake --install " TAVREL_BUILD " --prefix " + to + " --component tavrel-doc");
  EXPECT_EQ(outputOf("cd " + to +
                     "/share/doc/tavrel && grep -ohP '\\]\\(\\K[^):#]+(?=[)#])' *.md | "
                     "xargs ls -d 2>&1 >/dev/null || true"),
            "");
}

}  // namespace
}  // namespace tavrel
