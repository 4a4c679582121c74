#include "core/bounded_lines.h"

namespace kova {

bool bounded_lines::next() {
    if (left_ <= 0) {
        return false;
    }
    char &last = line_[size_ - 2];
    last = '\0'; // and stays so unless the line fills the buffer
    if (fgets(line_, size_, stream_) == nullptr) {
        return false;
    }
    left_ -= size_;
    for (int c = static_cast<unsigned char>(last); c != '\0' && c != '\n' && c != EOF && left_ > 0; --left_) {
        c = getc_unlocked(stream_);
    }
    return true;
}

} // namespace kova
