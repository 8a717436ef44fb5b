// The preview that a camera laid into its RAW file: from the file that is standard input to standard output, as JPEG.
// LibRaw gives a preview without notes of its own those of the file, the orientation among them.
#include <libraw/libraw.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

#include <memory>

namespace {

constexpr off_t kLargest = off_t{1} << 30;

bool writeWhole(const unsigned char* data, size_t size) {
    while (size > 0) {
        const ssize_t written = write(STDOUT_FILENO, data, size);
        if (written <= 0) return false;
        data += written;
        size -= static_cast<size_t>(written);
    }
    return true;
}

bool extract(void* file, size_t size) {
    const auto raw = std::make_unique<LibRaw>();
    if (raw->open_buffer(file, size) != LIBRAW_SUCCESS || raw->unpack_thumb() != LIBRAW_SUCCESS) return false;
    int error = LIBRAW_SUCCESS;
    const std::unique_ptr<libraw_processed_image_t, void (*)(libraw_processed_image_t*)> preview(
        raw->dcraw_make_mem_thumb(&error), LibRaw::dcraw_clear_mem);
    return preview != nullptr && error == LIBRAW_SUCCESS && preview->type == LIBRAW_IMAGE_JPEG &&
           writeWhole(preview->data, preview->data_size);
}

}  // namespace

int main() {
    struct stat status {};
    if (fstat(STDIN_FILENO, &status) != 0 || status.st_size <= 0 || status.st_size > kLargest) return 1;
    const size_t size = static_cast<size_t>(status.st_size);
    void* file = mmap(nullptr, size, PROT_READ, MAP_PRIVATE, STDIN_FILENO, 0);
    return file != MAP_FAILED && extract(file, size) ? 0 : 1;
}
