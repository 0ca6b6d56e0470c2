// SPDX-License-Identifier: Apache-2.0
#include "tools/exit_code.h"

const std::vector<ExitMeaning>& ExitMeanings() {
    static const std::vector<ExitMeaning> meanings{
        {EXIT_CODE_DONE, "done; also when Ctrl-C or SIGTERM ended what goes on until then"},
        {EXIT_CODE_FAILED, "something failed, or the desktop went away"},
        {EXIT_CODE_MISUSED, "the command line makes no sense"},
        {EXIT_CODE_READER_GONE, "the reader of a pipe has closed it"},
        {EXIT_CODE_NOT_WRITTEN, "output could not be written, such as to a full disk"},
    };
    return meanings;
}

std::vector<ExitMeaning> ExitMeaningsWith(const std::vector<ExitMeaning>& ownMeanings) {
    std::vector<ExitMeaning> meanings = ExitMeanings();
    for (ExitMeaning& meaning : meanings) {
        for (const ExitMeaning& own : ownMeanings) {
            if (own.code == meaning.code)
                meaning.text = own.text;
        }
    }
    return meanings;
}
