// SPDX-License-Identifier: Apache-2.0
// Other programs put their own libraries in the place of the two platform libraries: the program
// must load whichever comes first, and use nothing of them but the documented interface.
#include <set>

#include "cli_fixture.h"

namespace Test {
namespace {

const std::set<std::string> kInterface = {
    "KNOB_CheckSig",
    "KNOB_ParamListCreate",
    "KNOB_ParamListAddInt",
    "KNOB_ParamListAddString",
    "KNOB_ParamListDestroy",
    "KNOB_ParamListNumInstances",
    "KNOB_Get",
    "KNOB_Set",
    "KNOB_GetInstanceListAlloc",
    "NUC_ReturnStatusToString",
    "KNOB_NODE_hardware_cpu_cpuInfo",
    "KNOB_NODE_system_vmLimits",
    "KNOB_NODE_system_bootCmdLine",
    "KNOB_NODE_memory_comprehensive",
    "KNOB_NODE_sched_groupPathNameToID",
    "KNOB_NODE_sched_groups_groupCreate",
    "KNOB_NODE_sched_groups_delete",
    "KNOB_NODE_sched_groups_memAllocationInMB",
    "KNOB_NODE_sched_groups_cpuAllocationInPct",
    "KNOB_NODE_sched_groups_members_groups",
    "KNOB_NODE_sched_groups_stats_memoryStats",
    "KestrelConfigStore::sGlobalNamespace",
    "KestrelConfigStore::ConfigStore::GetStore(std::string const&)",
};

// The path that the loader takes LIBRARY from.
std::string loadedFrom(World &world, const std::string &library) {
  world.environment["LD_TRACE_LOADED_OBJECTS"] = "1";
  for (const std::string &line : lines(world.World::poolctl({}).out)) {
    const size_t name = line.find(library + " => ");
    if (name == std::string::npos) continue;
    const size_t begin = name + library.size() + 4;
    return std::filesystem::canonical(line.substr(begin, line.find(" (") - begin)).string();
  }
  return "not loaded";
}

TEST(PlatformLibraries, AreTheBuildsOwnWithoutOthers) {
  World world;
  EXPECT_EQ(loadedFrom(world, "libknob.so.1").find(standInFolder("").string()), std::string::npos);
  EXPECT_NE(loadedFrom(world, "libknob.so.1"), "not loaded");
  EXPECT_NE(loadedFrom(world, "libkestrelconfig.so.1"), "not loaded");
}

TEST(PlatformLibraries, GiveWayToThoseOfTheLibraryPath) {
  StandInWorld world;
  world.config("nothing = here");
  EXPECT_EQ(loadedFrom(world, "libknob.so.1"),
            std::filesystem::canonical(standInFolder("knob") / "libknob.so.1"));
  EXPECT_EQ(loadedFrom(world, "libkestrelconfig.so.1"),
            std::filesystem::canonical(standInFolder("config") / "libkestrelconfig.so.1"));
}

TEST(PlatformLibraries, GiveWayToThosePreloaded) {
  StandInWorld world;
  world.environment.erase("LD_LIBRARY_PATH");
  if (const char *other = getenv("LD_LIBRARY_PATH")) world.environment["LD_LIBRARY_PATH"] = other;
  world.environment["LD_PRELOAD"] = (standInFolder("knob") / "libknob.so.1").string() + " " +
                                    (standInFolder("config") / "libkestrelconfig.so.1").string();
  const auto file = world.file(
      "a.yaml", "- {name: a, mem: !config {object: [a, b, c], key: k, default: !calc numPCPUs}}\n");
  world.knob("cpus 77");
  expectRun(world.poolctl({"list", "-v", file}), 0,
            kCsvHeader + "host/opt/a,yes,77,77,-,-,0,-,1000\n", "");
  EXPECT_EQ(world.configTrace(), Calls{"GetStore \"scripted-global\""});
  EXPECT_EQ(world.misuse(), Calls{});
}

TEST(PlatformLibraries, AreUsedThroughTheDocumentedInterfaceAlone) {
  if (!std::filesystem::exists("/usr/bin/nm")) GTEST_SKIP() << "there is no nm here";
  const World world;
  const std::string program = (binFolder() / "poolctl").string();
  const ProcessResult result = world.run("/usr/bin/nm", {"--dynamic", "--demangle", program});
  ASSERT_EQ(result.status, 0) << result.err;
  std::set<std::string> used;
  for (std::string line : lines(result.out)) {
    const std::string longName =
        "std::__cxx11::basic_string<char, std::char_traits<char>, "
        "std::allocator<char> >";
    for (size_t at; (at = line.find(longName)) != std::string::npos;)
      line.replace(at, longName.size(), "std::string");
    const std::string symbol = line.substr(std::min<size_t>(19, line.size()));
    const bool isDescription = symbol.find("typeinfo") == 0 || symbol.find("vtable") == 0;
    const std::string plain = symbol.substr(0, symbol.find("[abi:"));
    if (!isDescription && (plain.find("KNOB_") == 0 || plain.find("NUC_") == 0 ||
                           plain.find("Knob::") == 0 || plain.find("Kestrel") == 0))
      used.insert(plain);
  }
  EXPECT_GE(used.size(), 20u);
  for (const std::string &symbol : used) EXPECT_EQ(kInterface.count(symbol), 1u) << symbol;
}

}  // namespace
}  // namespace Test
