// Helpers of the store's tests: a run environment whose key directory holds the delivered key
// files plus the test sections "StoreTest" (every structure and type) and "StoreSecond".
#pragma once

#include <filesystem>
#include <memory>
#include <string>

#include "qorv_description_section.h"
#include "qorvex_test_support.h"

namespace storetest {

namespace fs = std::filesystem;

/// Directory of this test folder (golden files, test key files).
inline fs::path testDir() { return fs::path(QORVEX_STORE_TEST_DIR); }
/// The external raw scene header written by another program (beside the repository in shared/).
inline fs::path externalSceneHeader()
{
    return fs::path(QORVEX_SHARED_DIR) / "scenes" / "ers-points-small" / "ers_sim_raw.sml";
}

/// A keys directory: share/qorvex/keys plus tests/store/keys.
class KeysDir {
public:
    KeysDir() : mDir("qorvex-store-keys")
    {
        for (const auto& aDir : {qtest::sourceShareDir() / "keys", testDir() / "keys"})
            for (const auto& aEntry : fs::directory_iterator(aDir))
                fs::copy_file(aEntry.path(), mDir.path() / aEntry.path().filename(), fs::copy_options::overwrite_existing);
    }
    const fs::path& path() const { return mDir.path(); }

private:
    qtest::TempDir mDir;
};

/// A run environment with the extended keys directory (and optional other options).
class StoreEnv {
public:
    explicit StoreEnv(qtest::ConfigOptions theOptions = {})
        : mKeys(), mEnv((theOptions.mKeysDir = theOptions.mKeysDir.empty() ? mKeys.path() : theOptions.mKeysDir, theOptions))
    {
    }
    qtest::InProcessEnvironment& env() { return mEnv; }
    fs::path path(const std::string& theName) const { return mEnv.workPath(theName); }
    const fs::path& keys() const { return mKeys.path(); }

private:
    KeysDir mKeys;
    qtest::InProcessEnvironment mEnv;
};

/// A header of the two test sections.
inline std::unique_ptr<CDescriptionHeader> makeTestHeader()
{
    return std::make_unique<CDescriptionHeader>(std::initializer_list<const char*>{"StoreTest", "StoreSecond"});
}

/// Fills every field of "StoreTest" with values that exercise the format: a NaN, texts to escape,
/// an unset string element, negative and large numbers.
void fillTestSection(CDescriptionHeader& theHeader);

/// Fills a full header with a complete raw ERS-2 product (5616 x 28000 echoes, nine state vectors):
/// the example of the header format's documentation.
void fillErsExample(CDescriptionHeader& theHeader);

}  // namespace storetest
