// SPDX-License-Identifier: Apache-2.0
#include "tools/standard_output.h"

WriteResult PrintAnswer(const std::string& text) {
    return PrintAnswer(text, StopFlag());
}

WriteResult PrintAnswer(const std::string& text, const StopNotice& stop) {
    CaptureOutput output(stop);
    if (WriteResult failure = output.Open("-"))
        return failure;
    if (WriteResult failure = output.Write(text.data(), text.size()))
        return failure;
    return output.Close();
}
