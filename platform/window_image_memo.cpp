// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics_images.h"
#include "platform/window_image_layers.h"

#include <cstddef>
#include <memory>
#include <new>
#include <utility>
#include <vector>

namespace platform {

struct CGWindowImageMemo::Kept {
    explicit Kept(const CGWindowImage& whole) : image(whole) {}

    CGWindowImage image; // its layers have no pictures
    std::vector<std::weak_ptr<const Picture>> pictures;
};

CGWindowImageMemo::CGWindowImageMemo() = default;

CGWindowImageMemo::~CGWindowImageMemo() = default;

void CGWindowImageMemo::Keep(const CGWindowImage* image) noexcept {
    std::unique_ptr<Kept> kept = std::move(m_kept);
    if (image == nullptr || image->moment == 0)
        return;
    try {
        if (kept == nullptr)
            kept = std::make_unique<Kept>(*image);
        else
            kept->image = *image;
        kept->pictures.clear();
        for (WindowLayer& layer : kept->image.layers) {
            kept->pictures.emplace_back(std::exchange(layer.picture, nullptr));
            layer.image = nullptr;
        }
        m_kept = std::move(kept);
    } catch (const std::bad_alloc&) { // NOLINT(bugprone-empty-catch): it is none then
    }
}

CGWindowImageRef CGWindowImageMemo::Recall() const noexcept {
    if (m_kept == nullptr)
        return nullptr;
    try {
        auto image = std::make_shared<CGWindowImage>(m_kept->image);
        for (std::size_t i = 0; i < image->layers.size(); ++i) {
            WindowLayer& layer = image->layers[i];
            layer.picture = m_kept->pictures[i].lock();
            layer.image = CGImageCreateWithPicture(layer.picture);
            if (layer.image == nullptr)
                return nullptr;
        }
        // Once they are held: what is written over later isn't theirs, and what was before belongs to another
        // moment.
        return CGWindowServerGetMoment() == image->moment ? image : nullptr;
    } catch (const std::bad_alloc&) {
        return nullptr;
    }
}

} // namespace platform
