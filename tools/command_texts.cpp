// SPDX-License-Identifier: Apache-2.0
#include "tools/command_texts.h"

#include <algorithm>

namespace {

CommandText TextOfList() {
    return {
        "list",
        "List what there is to share",
        {"Lists applications, windows or monitors: as a table, or with --json as one array of objects.",
         "With --watch the list comes first and then what happens to it, a line each, until Ctrl-C: + is there or "
         "comes, - goes, ~ has changed. JSON has an object a line then, whose first member \"change\" is \"added\", "
         "\"removed\" or \"changed\". Another stacking order alone is no change.",
         "Without --watch a desktop that goes away ends the command with code 1. With --watch everything goes, and "
         "the command goes on, for the case that the desktop comes back."},
        {{"screenshare list apps", "which applications can be shared"},
         {"screenshare list windows --json", "the windows, for a script"},
         {"screenshare list windows --watch | grep --line-buffered '^+'", "only windows that come"},
         {"screenshare list monitors --watch --json | consumer", "monitors that come and go, for a script"}},
        ExitMeanings()};
}

CommandText TextOfThumbnails() {
    return {
        "thumbnails",
        "Write the thumbnails of applications and windows that a picker would show",
        {"Each is a file, app-PID.png or window-ID.png, with a line on standard output as soon as it is there. An "
         "application shows its largest window; without one on the screen it has \"no picture\" and no file. What "
         "must not be shared is empty. Without --apps and --windows there are both kinds. Standard error counts "
         "them in the end.",
         "With --json each line is an object: \"kind\", \"id\", \"name\", \"file\", \"width\" and \"height\". "
         "Without a picture \"file\" is null."},
        {{"screenshare thumbnails pictures", "all of them, into the folder pictures"},
         {"screenshare thumbnails --windows --json pictures | jq -r .file", "only the names of the files"}},
        ExitMeaningsWith(
            {{EXIT_CODE_FAILED, "something failed, the desktop went away, or there is nothing to ask for"},
             {EXIT_CODE_NOT_WRITTEN, "a file could not be written, such as to a full disk"}})};
}

CommandText TextOfExplain() {
    return {
        "explain",
        "Draw what a share would show, and why",
        {"Writes a picture of the desktop with a verdict on each window, the regions of the share, and a table of "
         "reasons. Nothing is captured. Without --monitor, --app and --window it is about the main monitor.",
         "With --json the same comes as one JSON object, on standard output where no file is named: \"windows\", the "
         "front one first, each with its \"verdict\" and \"reason\"; and the rectangles of \"visible\", \"overlap\" "
         "and \"background\". A file for that is named before options that take many values, or behind --."},
        {{"screenshare explain share.svg", "a share of the main monitor"},
         {"screenshare explain --app 1234 --exclude-window 77 share.svg",
          "an application, a window of it kept out"},
         {"screenshare explain --json | jq -r '.windows[] | select(.verdict == \"kept\").title'",
          "the titles that a viewer may see"}},
        ExitMeaningsWith(
            {{EXIT_CODE_FAILED,
              "something failed, the desktop went away, or what is to be shared is not there"}})};
}

std::vector<std::string> CaptureParagraphs() {
    std::vector<std::string> paragraphs;
    paragraphs.emplace_back(
        "Shares the main monitor unless told otherwise. Frames equal to the one before are held back, but for one "
        "about each second. Without --png, --y4m or --raw they are only counted. --frames counts what is written, "
        "repeated pictures too.");
    paragraphs.emplace_back(
        "A y4m stream has one rate and one size: pictures are repeated for as long as they are to be seen, and "
        "those of another size are scaled into the first one's, on black.");
    paragraphs.emplace_back(
        "Modes: default waits for each picture; queued captures beside the frames' own pace and hands each over a "
        "frame later; session takes pictures of the whole display and paints over what must not be seen; mix draws "
        "the windows that may be seen again there.");
    paragraphs.emplace_back(
        "News and the statistics in the end go to standard error. With --json the statistics are one JSON object "
        "instead, in one line: on standard output, or where frames go there, on standard error.");
    paragraphs.emplace_back(
        "When the desktop goes away, a line tells so and the capture goes on, for the case that it comes back, until "
        "Ctrl-C or its limit of --seconds.");
    return paragraphs;
}

CommandText TextOfCapture() {
    return {
        "capture",
        "Capture what is shared until Ctrl-C or a limit",
        CaptureParagraphs(),
        {{"screenshare capture --seconds 5 --png frames", "pictures into the folder frames"},
         {"screenshare capture --monitor 2 --exclude-app 1234 --y4m - | ffmpeg -i - share.mkv",
          "a film of monitor 2, without an application"},
         {"screenshare capture --app Editor --mode queued --frames 100 --y4m editor.y4m",
          "an application by its name"},
         {"screenshare capture --no-pointer --raw - 2>form.txt | consumer",
          "bare pixels for another program"},
         {"screenshare capture --seconds 10 --json", "how fast it is here, for a script"}},
        ExitMeaningsWith({{EXIT_CODE_DONE, "a limit was reached, or Ctrl-C, or SIGTERM"},
                          {EXIT_CODE_FAILED, "something failed, or what is to be shared is not there"},
                          {EXIT_CODE_NOT_WRITTEN, "frames could not be written, such as to a full disk"}})};
}

CommandText TextOfDoctor() {
    return {
        "doctor",
        "Tell what of sharing will work on this desktop, what won't, and how to mend it",
        {"Tells which window server is in force and why, what the X display has (extensions, compositor, window "
         "manager, monitors), and what that is good for. A server that doesn't answer costs a few seconds."},
        {{"screenshare doctor", "what works here"},
         {"screenshare doctor --platform x11", "the same, with the X display asked for"},
         {"screenshare doctor --json | python3 -m json.tool", "for a script"}},
        ExitMeaningsWith({{EXIT_CODE_DONE, "monitors and windows can be shared"},
                          {EXIT_CODE_FAILED, "something is missing that sharing needs"}})};
}

CommandText TextOfDemo() {
    return {
        "demo",
        "Show a share with a window kept out, in each mode of capturing",
        {"Shares the main monitor without its frontmost window, or a built-in scene where there is no desktop, and "
         "writes two files into its folder: demo.png has the screen beside what others would see of it, demo.svg "
         "tells which windows are in the share, and why. It takes some five seconds. Files of that name are replaced.",
         "The terminal that it runs in is not what is kept out, where that can be told. In the built-in scene the "
         "pixels of the secret window are counted in each picture; one of them in a shared picture is a failure."},
        {{"screenshare demo", "your desktop, or the built-in scene"},
         {"screenshare demo --scene --out /tmp/demo", "the built-in scene, into another folder"},
         {"screenshare demo --exclude-window 31457287",
          "without a window that screenshare list windows has told"}},
        ExitMeaningsWith(
            {{EXIT_CODE_DONE, "the files are written; also when Ctrl-C or SIGTERM ended it before that"},
             {EXIT_CODE_FAILED, "there was no picture, the desktop went away, or a secret shows"},
             {EXIT_CODE_NOT_WRITTEN, "a file could not be written, such as to a full disk"}})};
}

} // namespace

const CommandText& ProgramText() {
    static const CommandText text{
        "screenshare",
        "Looks at what a screen share would show, and captures one",
        {"Each command has a help of its own: screenshare COMMAND --help. Complaints are one line on standard error "
         "that begins with \"screenshare:\"."},
        {{"screenshare demo", "what a share shows and what it keeps out, in pictures"},
         {"screenshare doctor", "what of sharing works on this desktop"},
         {"screenshare list windows", "what there is to share"},
         {"screenshare capture --seconds 5 --png frames", "five seconds of the main monitor, as pictures"},
         {"screenshare --platform simulated explain share.svg", "an invented desktop, on any machine"}},
        ExitMeanings()};
    return text;
}

const CommandText& TextOfCommand(std::string_view name) {
    static const std::vector<CommandText> texts{TextOfList(),    TextOfThumbnails(), TextOfExplain(),
                                                TextOfCapture(), TextOfDoctor(),     TextOfDemo()};
    static const CommandText none{};
    const auto found = std::find_if(texts.begin(), texts.end(),
                                    [name](const CommandText& text) { return text.name == name; });
    return found != texts.end() ? *found : none;
}

const std::vector<NamedText>& ProgramVariables() {
    static const std::vector<NamedText> variables{
        {"SCREENSHARE_PLATFORM",
         "The window server: auto (the default), x11, simulated or none. The option --platform goes before it."},
        {"SCREENSHARE_TRACE",
         "What the library tells on standard error: error, warning, info, debug or detail. Unset: nothing."},
        {"SCREENSHARE_DEBUG_DIR", "The folder of the debug file and of dumps, /tmp/screen_share unless set."},
        {"DISPLAY, XAUTHORITY", "The X display, and the file with the keys to it."},
        {"WAYLAND_DISPLAY, XDG_SESSION_TYPE",
         "They tell a Wayland session, whose X display shows nothing that is worth sharing: auto means none there."},
    };
    return variables;
}

const std::vector<NamedText>& ProgramFiles() {
    static const std::vector<NamedText> files{
        {"/tmp/screen_share/share_config.json",
         "The debug file, which is optional. It counts only when it and its folder belong to the user or to root, and "
         "nobody else may write to either. SCREENSHARE_DEBUG_DIR names another folder."},
    };
    return files;
}
