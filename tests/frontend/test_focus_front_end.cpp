// qorvex-focus through real processes: options to the driver's arguments file, a read-only
// archive, progress in both modes, a failing scene among good ones, Ctrl-C, and the Snakemake
// workflow on two scenes.
#include <gtest/gtest.h>

#include <sys/stat.h>

#include <cstdlib>
#include <filesystem>
#include <string>
#include <vector>

#include "qorv_json.h"
#include "qorvex_test_support.h"

namespace {

namespace fs = std::filesystem;

const fs::path kFocus = qtest::binaryDir() / "qorvex-focus";

/// A small ERS scene whose header carries its Doppler centroid: NAME_raw and NAME_raw.sml in theDir.
void simulate(const fs::path& theDir, const std::string& theName, const std::string& theLines = "1024")
{
    fs::create_directories(theDir);
    const qtest::RunResult r = qtest::runProgram(
        qtest::binaryDir() / "qorvex_simulate",
        {"--preset", "ers2", "--lines", theLines, "--samples", "1024", "--targets", "grid:1x2", "--write-doppler", "--quiet",
         "--out", (theDir / (theName + "_raw")).string(), "--config", (qtest::binaryDir().parent_path() / "etc").string()},
        {}, theDir);
    ASSERT_EQ(r.mStatus, 0) << r.mStderr;
}

std::string shellQuote(const std::string& s) { return "'" + s + "'"; }

TEST(FocusFrontEnd, OptionsBecomeTheArgumentsFileAndTheArchiveIsOnlyRead)
{
    qtest::TempDir aDir;
    const fs::path aArchive = aDir / "archive", aOut = aDir / "out";
    simulate(aArchive, "scene");
    const std::string aHeader = qtest::readFile(aArchive / "scene_raw.sml");
    fs::permissions(aArchive, fs::perms::owner_write | fs::perms::group_write | fs::perms::others_write, fs::perm_options::remove);

    // A bad command line runs nothing.
    for (const std::vector<std::string>& aBad : {std::vector<std::string>{"--bogus", (aArchive / "scene_raw").string()},
                                                 {"--out", aOut.string(), (aArchive / "missing_raw").string()},
                                                 {"--looks", "5", (aArchive / "scene_raw").string()},
                                                 {(aArchive / "scene_raw").string(), (aArchive / "scene_raw").string()}}) {
        const qtest::RunResult r = qtest::runProgram(kFocus, aBad, {}, aDir.path());
        EXPECT_EQ(r.mStatus, 2) << aBad[0];
        EXPECT_NE(r.mStderr.find("qorvex-focus: "), std::string::npos);
    }
    EXPECT_FALSE(fs::exists(aOut));
    // An output directory that cannot be written (here under a file, as tests run as root too)
    // fails the scene with the focuser's id.
    const qtest::RunResult aReadOnly = qtest::runProgram(
        kFocus, {"--out", (aArchive / "scene_raw.sml" / "out").string(), (aArchive / "scene_raw").string()}, {}, aDir.path());
    EXPECT_EQ(aReadOnly.mStatus, 1);
    EXPECT_NE(aReadOnly.mStdout.find("failure 261123: the output directory"), std::string::npos) << aReadOnly.mStdout;
    // A disk that fills during the run (a file size limit, with its signal ignored as a full disk
    // gives no signal) fails the scene with the write id and leaves nothing half-written.
    const fs::path aFull = aDir / "full";
    const qtest::RunResult aDiskFull = qtest::runProgram(
        "/bin/sh", {"-c", "trap '' XFSZ; ulimit -f 2048; exec " + kFocus.string() + " --out " + shellQuote(aFull.string()) +
                              " " + shellQuote((aArchive / "scene_raw").string())},
        {}, aDir.path(), 300);
    EXPECT_EQ(aDiskFull.mStatus, 1);
    EXPECT_NE(aDiskFull.mStdout.find("failure 261124: "), std::string::npos) << aDiskFull.mStdout;
    EXPECT_NE(aDiskFull.mStdout.find("on file " + (aFull / "scene_rc_tmp").string()), std::string::npos) << aDiskFull.mStdout;
    EXPECT_FALSE(fs::exists(aFull / "scene_rc"));
    EXPECT_FALSE(fs::exists(aFull / "scene_rc_tmp"));

    const qtest::RunResult r = qtest::runProgram(
        kFocus, {"--out", aOut.string(), "--looks", "2x4", "--no-tiff", "--keep", "--skip", "1", "--skip", "3", "--no-ambiguity",
                 "--doppler-degree", "0", "--json", (aDir / "summary.json").string(), (aArchive / "scene_raw").string()},
        {}, aDir.path(), 300);
    fs::permissions(aArchive, fs::perms::owner_write, fs::perm_options::add);
    ASSERT_EQ(r.mStatus, 0) << r.mStdout << r.mStderr;

    const std::string aExpected = "qorvex-focus: scene_raw\n" + (aOut / "scene_raw").string() + "\nOK\n" +
                                  (aOut / "scene_slc").string() +
                                  "\n2\n4\nOK\nNotOK\nNotOK\n0.333\n0\nNotOK\nNotOK\nNotOK\nNotOK\nNotOK\nOK\nNotOK\nOK\nNotOK\n0\n";
    EXPECT_EQ(qtest::readFile(aOut / "scene.qorvex" / "arguments.txt"), aExpected);
    EXPECT_EQ(qtest::readFile(aArchive / "scene_raw.sml"), aHeader);
    EXPECT_EQ(fs::read_symlink(aOut / "scene_raw"), aArchive / "scene_raw");
    for (const char* aProduct : {"scene_slc", "scene_pwr", "scene_rc"}) EXPECT_TRUE(fs::exists(aOut / aProduct)) << aProduct;
    EXPECT_FALSE(fs::exists(aOut / "scene_pwr.tif"));
    // Plain progress lines when the output is not a terminal, then the summary.
    EXPECT_NE(r.mStdout.find("scene: SAR azimuth omega/k processor"), std::string::npos) << r.mStdout;
    EXPECT_NE(r.mStdout.find("== scene ("), std::string::npos);

    const CJson aSummary = CJson::parseFile((aDir / "summary.json").string());
    EXPECT_TRUE(aSummary["all_succeeded"].boolean());
    const CJson& s = aSummary["scenes"][std::size_t{0}];
    EXPECT_EQ(s["state"].string(), "done");
    EXPECT_EQ(s["products"][std::size_t{0}]["path"].string(), (aOut / "scene_slc").string());
    EXPECT_EQ(s["products"][std::size_t{0}]["bytes"].number(), static_cast<double>(fs::file_size(aOut / "scene_slc")));
    EXPECT_GT(s["velocity_m_s"].number(), 7000.0);
    EXPECT_GE(s["steps"].size(), 4u);
}

TEST(FocusFrontEnd, AFailingSceneLeavesTheOthersAndTheTerminalSeesOneLinePerScene)
{
    qtest::TempDir aDir;
    simulate(aDir / "in", "good");
    fs::create_directories(aDir / "in");
    fs::copy_file(aDir / "in" / "good_raw", aDir / "in" / "lonely_raw");  // no header
    fs::copy_file(aDir / "in" / "good_raw", aDir / "in" / "broken_raw");
    qtest::writeFile(aDir / "in" / "broken_raw.sml", "<?xml version=\"1.0\"?>\n<Nothing>\n");
    qtest::writeFile(aDir / "in" / "notes.txt", "neither a raw product nor an archive\n");
    const std::string aCommand = kFocus.string() + " --out " + shellQuote((aDir / "out").string()) +
                                 " --jobs 2 --skip 1 --skip 3 --no-ambiguity --no-tiff --json " +
                                 shellQuote((aDir / "summary.json").string()) + " " +
                                 shellQuote((aDir / "in" / "lonely_raw").string()) + " " +
                                 shellQuote((aDir / "in" / "broken_raw").string()) + " " +
                                 shellQuote((aDir / "in" / "notes.txt").string()) + " " +
                                 shellQuote((aDir / "in" / "good_raw").string());
    // A pseudo-terminal: progress is redrawn in place.
    const qtest::RunResult r = qtest::runProgram("/usr/bin/script", {"-qec", aCommand, "/dev/null"}, {}, aDir.path(), 300);
    EXPECT_EQ(r.mStatus, 1) << r.mStdout;
    EXPECT_NE(r.mStdout.find("\033[2K"), std::string::npos);
    EXPECT_NE(r.mStdout.find("\033[4A"), std::string::npos);

    const CJson aSummary = CJson::parseFile((aDir / "summary.json").string());
    EXPECT_FALSE(aSummary["all_succeeded"].boolean());
    const CJson& aScenes = aSummary["scenes"];
    ASSERT_EQ(aScenes.size(), 4u);
    EXPECT_EQ(aScenes[std::size_t{0}]["state"].string(), "FAILED");
    EXPECT_EQ(aScenes[std::size_t{0}]["failure_id"].number(), 261122);
    EXPECT_NE(aScenes[std::size_t{0}]["failure_text"].string().find("no header"), std::string::npos);
    EXPECT_EQ(aScenes[std::size_t{1}]["state"].string(), "FAILED");
    EXPECT_GT(aScenes[std::size_t{1}]["failure_id"].number(), 0);
    EXPECT_FALSE(aScenes[std::size_t{1}]["failure_text"].string().empty());
    EXPECT_EQ(aScenes[std::size_t{2}]["failure_id"].number(), 979201);
    EXPECT_EQ(aScenes[std::size_t{3}]["state"].string(), "done");
    EXPECT_TRUE(fs::exists(aDir / "out" / "good_slc"));
    EXPECT_FALSE(fs::exists(aDir / "out" / "broken_slc"));
}

TEST(FocusFrontEnd, CtrlCStopsTheRunThroughTheWorkingFileAndLeavesNoProduct)
{
    qtest::TempDir aDir;
    simulate(aDir / "in", "long", "16384");
    // The front end leads a process group of its own; the interrupt goes to the group once the
    // focusing step has begun, as Ctrl-C at a terminal would. theSecondRun runs meanwhile.
    const auto interrupt = [&](const std::string& theOut, const std::string& theSecondRun, const std::string& theKill) {
        const std::string aScript =
            "setsid " + kFocus.string() + " --out " + theOut + " --skip 1 --skip 3 --no-ambiguity in/long_raw > progress.txt 2>&1 &\n"
            "pid=$!\n"
            "for i in $(seq 600); do grep -q 'omega/k' progress.txt && break; sleep 0.1; done\n" +
            theSecondRun + "\n" + theKill + "\nwait $pid\necho $? >> progress.txt\n";
        const qtest::RunResult r = qtest::runProgram("/bin/sh", {"-c", aScript}, {}, aDir.path(), 600);
        EXPECT_EQ(r.mStatus, 0) << r.mStderr;
        for (const auto& f : fs::directory_iterator(aDir / theOut)) {
            const std::string n = f.path().filename().string();
            EXPECT_EQ(n.find("_tmp"), std::string::npos) << n;
            EXPECT_NE(n, "long_slc");
        }
        return qtest::readFile(aDir / "progress.txt");
    };
    // One Ctrl-C: the driver stops through the working file. A second run on the same scene and
    // output directory is refused while the first one works.
    std::string aProgress = interrupt("out", kFocus.string() + " --out out in/long_raw > second.txt 2>&1; echo $? >> second.txt",
                                      "kill -INT -$pid");
    EXPECT_EQ(aProgress.substr(aProgress.size() - 2), "1\n") << aProgress;
    EXPECT_NE(aProgress.find("long: stopped"), std::string::npos) << aProgress;
    EXPECT_NE(aProgress.find("stopped by the operator"), std::string::npos) << aProgress;
    const std::string aSecond = qtest::readFile(aDir / "second.txt");
    EXPECT_NE(aSecond.find("failure 261123: another run is focusing long into"), std::string::npos) << aSecond;
    EXPECT_EQ(aSecond.substr(aSecond.size() - 2), "1\n") << aSecond;
    // Two: the driver's process group ends at once, even when the driver does not answer (here
    // held stopped, so that it cannot end on the first).
    aProgress = interrupt("out2",
                          "for p in /proc/[0-9]*; do grep -qs 'long[.]qorvex/arguments' $p/cmdline && kill -STOP ${p#/proc/}; done",
                          "kill -INT -$pid; sleep 0.3; kill -INT -$pid");
    EXPECT_EQ(aProgress.substr(aProgress.size() - 2), "1\n") << aProgress;
    EXPECT_NE(aProgress.find("failure 326400: ended at once by a second interrupt"), std::string::npos) << aProgress;
}

TEST(FocusFrontEnd, TheWorkflowFocusesEveryRawProductAndArchiveOfADirectory)
{
    if (std::system("snakemake --version > /dev/null 2>&1") != 0) GTEST_SKIP() << "snakemake is not installed";
    qtest::TempDir aDir;
    simulate(aDir / "raw", "first");
    simulate(aDir / "raw", "second");
    // An ERS CEOS archive beside them: a scene named by its directory, its products by the import.
    const qtest::RunResult aArchive = qtest::runProgram(
        qtest::binaryDir() / "qorvex_simulate",
        {"--preset", "ers2", "--format", "ceos", "--lines", "1024", "--samples", "1024", "--targets", "grid:1x2", "--quiet",
         "--out", (aDir / "raw" / "archive").string(), "--config", (qtest::binaryDir().parent_path() / "etc").string()},
        {}, aDir.path());
    ASSERT_EQ(aArchive.mStatus, 0) << aArchive.mStderr;
    const qtest::RunResult r = qtest::runProgram(
        "/usr/bin/env",
        {"snakemake", "-s", (qtest::sourceShareDir().parent_path().parent_path() / "workflow" / "Snakefile").string(),
         "--cores", "2", "-d", aDir.path().string(), "--config", "raw_dir=" + (aDir / "raw").string(),
         "out_dir=" + (aDir / "focused").string(), "qorvex_focus=" + kFocus.string(),
         "options=--skip 1 --skip 3 --no-ambiguity --no-tiff"},
        {}, aDir.path(), 600);
    ASSERT_EQ(r.mStatus, 0) << r.mStdout << r.mStderr;
    for (const char* aScene : {"first", "second"}) {
        const fs::path d = aDir / "focused" / aScene;
        EXPECT_TRUE(fs::exists(d / (std::string(aScene) + "_slc"))) << aScene;
        EXPECT_TRUE(CJson::parseFile((d / (std::string(aScene) + "_summary.json")).string())["all_succeeded"].boolean());
    }
    const CJson aSummary = CJson::parseFile((aDir / "focused" / "archive" / "archive_summary.json").string());
    EXPECT_TRUE(aSummary["all_succeeded"].boolean());
    const std::string aName = aSummary["scenes"][std::size_t{0}]["name"].string();
    EXPECT_EQ(aName.rfind("ERS2_", 0), 0u) << aName;
    EXPECT_TRUE(fs::exists(aDir / "focused" / "archive" / (aName + "_slc")));
}

}  // namespace
