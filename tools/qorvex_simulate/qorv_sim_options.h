// Command line of qorvex_simulate: parsing into a scene, and the help text.
#pragma once

#include <string>
#include <vector>

#include "qorv_sim_scene.h"

/// What the command line asks for beyond the scene.
struct CSimCommand {
    std::string mRoot;          // output root; empty: "sim_" + preset
    std::string mConfigDir;     // directory of Qorvex_configuration.ini; empty: the environment's
    bool mQuiet = false;
    bool mHelp = false;
};

/// The help text.
std::string fqorvSimUsage();

/// Builds the scene of a command line (preset, scene file, options; not yet completed). Throws
/// std::runtime_error with a message for the user on a bad option or value.
void fqorvSimParseCommandLine(const std::vector<std::string>& theArgs, CSimScene& theScene, CSimCommand& theCommand);
