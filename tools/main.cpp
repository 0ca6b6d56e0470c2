// SPDX-License-Identifier: Apache-2.0
#include "tools/command_line.h"

int main(int argc, char** argv) {
    return RunCommandLine(argc, argv);
}
