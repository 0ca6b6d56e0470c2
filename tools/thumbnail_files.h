// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tools/png_folder.h"
#include "tools/text_table.h"

#include <screenshare/share_thumbnail.h>

#include <string>
#include <vector>

/// What a thumbnail is to be made of.
struct ThumbnailItem {
    const char* kind = ""; ///< "app" or "window".
    unsigned id = 0;
    std::string name; ///< Of the application, or the window's title.
};

enum class ThumbnailForm {
    Table,
    Json, ///< An object a line.
};

/// Where thumbnails go: each into a file app-PID.png or window-ID.png, with a line on standard output.
/// Threads: one at a time. Lifetime: the notice stays longer.
class ThumbnailFiles {
public:
    ThumbnailFiles(const std::string& folder, ThumbnailForm form, const StopNotice& stop)
        : m_form(form),
          m_stop(stop),
          m_folder(folder),
          m_output(stop) {}

    /// Once. Makes the folder and prints the headings of a table, which has room for `items` then.
    WriteResult Open(const std::vector<ThumbnailItem>& items);
    WriteResult Write(const ThumbnailItem& item, const ImageData& image);
    /// Where there was nothing to be had: the line alone.
    WriteResult TellMissing(const ThumbnailItem& item);

    /// Whether the notice was raised.
    bool IsStopped() const { return m_stop.IsRaised(); }
    int FileCount() const { return m_files; }
    int MissingCount() const { return m_missing; }
    /// See CaptureOutput::PipeDescriptor.
    int PipeDescriptor() const { return m_output.PipeDescriptor(); }

private:
    WriteResult Print(const std::string& line);

    const ThumbnailForm m_form;
    const StopNotice& m_stop;
    PngFolder m_folder;
    CaptureOutput m_output;
    TextColumns m_columns;
    int m_files = 0;
    int m_missing = 0;
};
