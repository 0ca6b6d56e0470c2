// SPDX-License-Identifier: Apache-2.0
#include "tools/thumbnail_files.h"

#include "src/share_image_save.h"
#include "tools/json_text.h"

namespace {

/// What hardly any size is longer than.
constexpr const char* LONG_SIZE = "1000x1000";

std::string FileName(const ThumbnailItem& item) {
    return item.kind + ("-" + std::to_string(item.id)) + ".png";
}

std::vector<std::string> CellsOf(const ThumbnailItem& item, const std::string& size,
                                 const std::string& file) {
    return {item.kind, std::to_string(item.id), size, file, item.name};
}

JsonObjectText JsonOf(const ThumbnailItem& item) {
    JsonObjectText object;
    object.String("kind", item.kind).Number("id", item.id).String("name", item.name);
    return object;
}

} // namespace

WriteResult ThumbnailFiles::Open(const std::vector<ThumbnailItem>& items) {
    if (WriteResult failure = m_folder.Open())
        return failure;
    if (WriteResult failure = m_output.Open("-"))
        return failure;
    const std::vector<std::string> headings{"KIND", "ID", "SIZE", "FILE", "NAME"};
    m_columns.Widen(headings);
    for (const ThumbnailItem& item : items)
        m_columns.Widen(CellsOf(item, LONG_SIZE, m_folder.PathOf(FileName(item))));
    return m_form == ThumbnailForm::Table ? Print(m_columns.Line(headings)) : std::nullopt;
}

WriteResult ThumbnailFiles::Write(const ThumbnailItem& item, const ImageData& image) {
    const std::string name = FileName(item);
    if (WriteResult failure = m_folder.Write(
            name, RawDataToImage(image.data, image.width, image.height, image.lineBytes, image.format)))
        return failure;
    ++m_files;
    const std::string path = m_folder.PathOf(name);
    if (m_form == ThumbnailForm::Json) {
        return Print(JsonOf(item)
                         .String("file", path)
                         .Number("width", image.width)
                         .Number("height", image.height)
                         .Text() +
                     "\n");
    }
    const std::string size = std::to_string(image.width) + "x" + std::to_string(image.height);
    return Print(m_columns.Line(CellsOf(item, size, path)));
}

WriteResult ThumbnailFiles::TellMissing(const ThumbnailItem& item) {
    ++m_missing;
    if (m_form == ThumbnailForm::Json)
        return Print(JsonOf(item).Null("file").Text() + "\n");
    return Print(m_columns.Line(CellsOf(item, "", "no picture")));
}

WriteResult ThumbnailFiles::Print(const std::string& line) {
    WriteResult failure = m_output.Write(line.data(), line.size());
    // Whoever stops it may well have stopped its reader, too.
    return IsStopped() ? std::nullopt : failure;
}
