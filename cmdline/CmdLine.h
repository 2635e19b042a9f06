// The boot mode and the build type, from the kernel command line.
#pragma once

#include <string>

#include "cmdline/StringPairParser.h"

// Reads the kernel command line once, at construction.
class CmdLine : public StringPairParser {
  public:
    CmdLine();

    // Returns the first line of the kernel command line, up to 8191 bytes or the first NUL. Empty
    // if it cannot be read.
    static std::string GetCmdLine();

    // Returns true if the device was booted into recovery or upgrade mode.
    bool IsUpgradeMode() const;

    // Returns true if the device runs a factory build.
    bool IsFactoryVersion() const;

  private:
    bool upgradeMode = false;
};
