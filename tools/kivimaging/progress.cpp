#include "progress.h"

namespace kivcli {

std::string progressLine(int done, int total, const char* name) {
    if (total < 1) total = 1;
    if (done < 0) done = 0;
    if (done > total) done = total;
    int filled = static_cast<int>(static_cast<long long>(done) * kProgressBarWidth / total);
    std::string line = "[";
    line.append(filled, '#');
    line.append(kProgressBarWidth - filled, '.');
    line += "] ";
    std::string count = std::to_string(done) + "/" + std::to_string(total);
    // Right-align the count so the name does not jump as the digits grow.
    size_t digits = 2 * std::to_string(total).size() + 1;
    if (count.size() < digits) line.append(digits - count.size(), ' ');
    line += count;
    if (name != nullptr && name[0] != '\0') {
        std::string n = name;
        if (n.size() > 40) n = "..." + n.substr(n.size() - 37);
        line += "  " + n;
    }
    return line;
}

ProgressBar::ProgressBar(FILE* out, int total, bool enabled)
    : mOut(out), mTotal(total), mEnabled(enabled && out != nullptr) {}

ProgressBar::~ProgressBar() {
    finish();
}

void ProgressBar::update(int done, const char* name) {
    if (!mEnabled) return;
    std::string line = progressLine(done, mTotal, name);
    size_t length = line.size();
    // Blank out the tail of a longer previous line.
    if (length < mLastLength) line.append(mLastLength - length, ' ');
    mLastLength = length;
    fprintf(mOut, "\r%s", line.c_str());
    fflush(mOut);
}

void ProgressBar::finish() {
    if (!mEnabled || mLastLength == 0) return;
    fputc('\n', mOut);
    fflush(mOut);
    mLastLength = 0;
}

}  // namespace kivcli
