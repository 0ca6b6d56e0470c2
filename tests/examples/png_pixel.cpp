// SPDX-License-Identifier: Apache-2.0
//
// png_pixel FILE X Y
//
// Prints size and one pixel of a PNG file, "640x480 #rrggbbaa", for test scripts.

#include <png.h>

#include <cstdio>
#include <cstdlib>
#include <vector>

int main(int argc, char** argv) {
    if (argc != 4) {
        std::fprintf(stderr, "usage: png_pixel FILE X Y\n");
        return 2;
    }
    png_image image{};
    image.version = PNG_IMAGE_VERSION;
    if (png_image_begin_read_from_file(&image, argv[1]) == 0) {
        std::fprintf(stderr, "png_pixel: %s: %s\n", argv[1], image.message);
        return 1;
    }
    image.format = PNG_FORMAT_RGBA;
    std::vector<png_byte> pixels(PNG_IMAGE_SIZE(image));
    if (png_image_finish_read(&image, nullptr, pixels.data(), 0, nullptr) == 0) {
        std::fprintf(stderr, "png_pixel: %s: %s\n", argv[1], image.message);
        return 1;
    }
    const unsigned long x = std::strtoul(argv[2], nullptr, 10);
    const unsigned long y = std::strtoul(argv[3], nullptr, 10);
    if (x >= image.width || y >= image.height) {
        std::fprintf(stderr, "png_pixel: %s: %lu,%lu lies outside\n", argv[1], x, y);
        return 1;
    }
    const png_byte* pixel = pixels.data() + (y * image.width + x) * 4;
    std::printf("%ux%u #%02x%02x%02x%02x\n", image.width, image.height, pixel[0], pixel[1], pixel[2],
                pixel[3]);
    return 0;
}
