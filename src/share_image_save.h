// SPDX-License-Identifier: Apache-2.0
#pragma once

class IShareFrame;

/// Writes a frame as a PNG file. False when nothing was written.
bool SaveFrameToPNG(IShareFrame* frame, const char* path);
