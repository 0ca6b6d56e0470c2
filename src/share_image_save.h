// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/cg_image.h"

#include <screenshare/share_frame.h>

/// Pictures as files, for a developer to look at.
///
/// Raw pixels lie line after line, `lineBytes` apart; the caller answers for it that they are there. Formats
/// 1 and 2 are taken as premultiplied. Threads: any; a frame belongs to the caller for the length of the
/// call. Nothing is kept. Errors:  false or null. Nothing is traced or thrown.

/// Writes an uncompressed 24-bit bitmap; only formats 1 and 3. `lineBytes` 0 means lines without gaps. The
/// channels stay in their order and the alpha is dropped, so red and blue change places for whoever looks at
/// the file. False when the file can't be opened or must not be made; whether the writes succeed is not
/// looked at.
bool SaveRawDataToBmp(unsigned char* data, int width, int height, int lineBytes, SHARE_FRAME_FORMAT format,
                      const char* path);

/// A copy of the pixels as an image. Null for a format other than 1, 2 and 3 and for lines shorter than their
/// pixels.
platform::CGImageRef RawDataToImage(unsigned char* data, int width, int height, int lineBytes,
                                    SHARE_FRAME_FORMAT format);
platform::CGImageRef ShareFrameToImage(IShareFrame* frame);

// The rest give true as soon as there was an encoded picture to write. Whether the file could be written is
// not looked at; a file that could not is not there, or is still what it was. Only the user may open it, and
// a link under its name is replaced and not followed.

/// `quality` from 0 to 1.
bool SaveRawDataToJPEG(unsigned char* data, int width, int height, int lineBytes, SHARE_FRAME_FORMAT format,
                       const char* path, float quality);
/// False for a null path.
bool SaveFrameToJPEG(IShareFrame* frame, float quality, const char* path);
/// A null path writes nothing, and the result is told all the same.
bool SaveFrameToPNG(IShareFrame* frame, const char* path);

/// Copies the path of the user's documents folder. `buffer` has room for `length` + 1 bytes: of a longer path
/// `length` bytes are copied, and the zero stands behind them. False when there is no such folder, and for a
/// null buffer or a negative length.
bool GetDocumentDir(char* buffer, int length);
