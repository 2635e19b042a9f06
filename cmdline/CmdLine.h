// How the device was booted, from the kernel command line.
#pragma once

#include <string>

#include "cmdline/StringPairParser.h"

// Reads the command line once, at construction.
class CmdLine : public StringPairParser {
  public:
    CmdLine();

    // The first line of the kernel command line, at most 8191 bytes and up to its first NUL. Empty
    // when it cannot be read.
    static std::string GetCmdLine();

    // Booted into recovery or upgrade.
    bool IsUpgradeMode() const;

    // Booted into a factory build.
    bool IsFactoryVersion() const;

  private:
    bool upgradeMode = false;
};
