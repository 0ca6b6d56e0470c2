// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/window_storage_fetch.h"

#include "platform/x11/fetch_plan.h"

#include <algorithm>
#include <cstring>
#include <utility>

namespace platform::x11 {

namespace {

/// Reads of one storage that are on their way together.
constexpr std::size_t MOST_PIECES = 16;

} // namespace

StorageFetch::StorageFetch(const FetchTools& tools, std::shared_ptr<WindowStorage> storage,
                           const ServerPixels& pixels)
    : m_tools(tools),
      m_storage(std::move(storage)),
      m_pixels(pixels),
      m_renewals(m_storage->Renewals()) {}

void StorageFetch::Ask() {
    // Where it has turned out what is the window's own, it isn't known when that was painted.
    if (!m_storage->HasPixels(m_pixels))
        AskForAll();
    else if (m_storage->HasChanged())
        m_storage->AskForDamage(m_tools.parts);
}

void StorageFetch::AskForAll() {
    WindowStorage& storage = *m_storage;
    storage.DropAhead();
    storage.TakePixels();
    storage.CountChanges();
    m_result = {nullptr, storage.Width(), storage.Height(), m_pixels, storage.Proof().Unproven()};
    const PixelRect all{0, 0, m_result.width, m_result.height};
    m_pieces.push_back({all, true});
    m_damage = PixelRegion(all);
    m_result.block = m_tools.pool.Take(m_result.Stride() * static_cast<std::size_t>(m_result.height));
    m_failed = m_result.block == nullptr;
    if (!m_failed)
        AskFor(m_pieces.front());
}

void StorageFetch::AskForPixels() {
    if (!m_pieces.empty())
        return;
    if (!m_storage->AwaitDamage()) {
        m_storage->TakePixels();
        m_failed = true;
        return;
    }
    std::optional<PixelsAhead> ahead = m_storage->TakeAhead();
    m_damage = m_storage->Damage();
    if (m_damage.IsEmpty())
        return;
    if (ahead)
        return TakeAhead(*std::move(ahead));
    Plan(m_damage);
    m_result = m_storage->TakePixels();
    m_failed = !TakeMemory();
    if (m_failed)
        return;
    for (Piece& piece : m_pieces)
        AskFor(piece);
}

/// All that was damaged has been asked for already.
void StorageFetch::TakeAhead(PixelsAhead ahead) {
    const PixelRect& rect = ahead.rect;
    m_bytesAskedFor +=
        m_pixels.BytesPerRow(rect.right - rect.left) * static_cast<std::size_t>(rect.bottom - rect.top);
    m_result = m_storage->TakePixels();
    m_pieces.push_back({rect, ahead.isOfRows, 0, std::move(ahead.read)});
    // Whole rows are on their way to the result's own memory, which nobody else had.
    if (ahead.isOfRows)
        return;
    m_narrow = std::move(ahead.block);
    m_failed = !TakeMemory();
}

void StorageFetch::Plan(const PixelRegion& damage) {
    const int width = m_storage->Width();
    std::size_t narrowBytes = 0;
    for (PixelRect& rect : FewerRects(damage.Rects(), MOST_PIECES)) {
        Piece piece{rect, IsReadAsRows(rect.right - rect.left, width)};
        if (piece.isOfRows) {
            piece.rect.left = 0;
            piece.rect.right = width;
        } else {
            piece.offset = narrowBytes;
            narrowBytes += m_pixels.BytesPerRow(rect.right - rect.left) *
                           static_cast<std::size_t>(rect.bottom - rect.top);
        }
        m_pieces.push_back(std::move(piece));
    }
    if (narrowBytes > 0)
        m_narrow = m_tools.pool.Take(narrowBytes);
    m_failed = narrowBytes > 0 && m_narrow == nullptr;
}

bool StorageFetch::TakeMemory() {
    if (!m_failed && !IsOnlyShare(m_result.block)) {
        m_before = m_result;
        m_result.block = m_tools.pool.Take(m_before.block->Size());
    }
    return !m_failed && m_result.block != nullptr;
}

void StorageFetch::AskFor(Piece& piece) {
    const PixelRect& rect = piece.rect;
    const int width = rect.right - rect.left;
    if (piece.isOfRows)
        piece.offset = static_cast<std::size_t>(rect.top) * m_result.Stride();
    piece.read =
        RowsRead::Ask(m_tools.connection, m_storage->Pixmap(), rect.left, rect.top, width, rect.bottom,
                      piece.isOfRows ? *m_result.block : *m_narrow, piece.offset, m_pixels.BytesPerPixel());
    m_bytesAskedFor += m_pixels.BytesPerRow(width) * static_cast<std::size_t>(rect.bottom - rect.top);
}

void StorageFetch::Fail() {
    m_failed = true;
    m_storage->ForgetPixmap();
}

void StorageFetch::Finish() {
    if (m_failed)
        return Fail();
    if (m_before.block != nullptr)
        CopyOthersRows();
    bool areHere = true;
    for (Piece& piece : m_pieces)
        areHere = piece.read.Finish(m_tools.connection) && areHere;
    if (!areHere)
        return Fail();
    for (const Piece& piece : m_pieces) {
        if (piece.isOfRows)
            TakeInRows(piece);
        else
            TakeInCopied(piece);
    }
}

/// Those that the server doesn't write to, while it is at the others.
void StorageFetch::CopyOthersRows() {
    const std::size_t stride = m_result.Stride();
    const auto copy = [&](int top, int bottom) {
        const std::size_t offset = stride * static_cast<std::size_t>(top);
        if (top < bottom)
            std::memcpy(m_result.block->Bytes() + offset, m_before.block->Bytes() + offset,
                        stride * static_cast<std::size_t>(bottom - top));
    };
    int row = 0;
    for (const Piece& piece : m_pieces) { // from top to bottom
        if (!piece.isOfRows)
            continue;
        copy(row, piece.rect.top);
        row = std::max(row, piece.rect.bottom);
    }
    copy(row, m_result.height);
}

/// A window that was moved says that it has changed all over, and hasn't.
void StorageFetch::TakeInRows(const Piece& piece) {
    const std::size_t bytes =
        m_result.Stride() * static_cast<std::size_t>(piece.rect.bottom - piece.rect.top);
    const bool isSame =
        m_before.block != nullptr && std::memcmp(m_result.block->Bytes() + piece.offset,
                                                 m_before.block->Bytes() + piece.offset, bytes) == 0;
    if (!isSame)
        m_written.Add(piece.rect);
}

void StorageFetch::TakeInCopied(const Piece& piece) {
    const auto left = static_cast<std::size_t>(piece.rect.left);
    const auto width = static_cast<std::size_t>(piece.rect.right - piece.rect.left);
    const std::size_t bytes = width * m_pixels.BytesPerPixel();
    const std::size_t sourceStride = m_pixels.BytesPerRow(piece.rect.right - piece.rect.left);
    PixelRect written{piece.rect.left, piece.rect.bottom, piece.rect.right, piece.rect.bottom};
    for (int y = piece.rect.top; y < piece.rect.bottom; ++y) {
        const std::uint8_t* const source =
            m_narrow->Bytes() + piece.offset + static_cast<std::size_t>(y - piece.rect.top) * sourceStride;
        std::uint8_t* const target = m_result.block->Bytes() +
                                     static_cast<std::size_t>(y) * m_result.Stride() +
                                     left * m_pixels.BytesPerPixel();
        if (std::memcmp(target, source, bytes) == 0)
            continue;
        std::memcpy(target, source, bytes);
        written.top = std::min(written.top, y);
        written.bottom = y + 1;
    }
    if (written.top < written.bottom)
        m_written.Add(written);
}

void StorageFetch::Give() {
    if (m_failed || m_pieces.empty() || m_storage->Renewals() != m_renewals)
        return;
    // What was painted since the damage was asked for may be in all that was fetched, and will be told later.
    if (!m_storage->HasChanged())
        m_written.Intersect(m_damage);
    const bool isSame = m_written.IsEmpty() && m_before.block != nullptr;
    m_storage->GivePixels(isSame ? std::move(m_before) : std::move(m_result), m_written);
}

} // namespace platform::x11
