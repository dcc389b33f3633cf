// A one-line progress bar for batch runs on a terminal.
#ifndef TOOLS_KIVIMAGING_PROGRESS_H
#define TOOLS_KIVIMAGING_PROGRESS_H

#include <stdio.h>

#include <string>

namespace kivcli {

constexpr int kProgressBarWidth = 30;

// "[#######.......]  3/10  name": `done` of `total` items, the bar
// kProgressBarWidth cells wide, the name cut to its last 40 characters.
std::string progressLine(int done, int total, const char* name);

// Redraws the line in place with a carriage return; does nothing unless
// enabled (the tool enables it when standard output is a terminal).
class ProgressBar {
public:
    ProgressBar(FILE* out, int total, bool enabled);
    ~ProgressBar();

    void update(int done, const char* name);
    // Ends the line; called by the destructor as well.
    void finish();

    ProgressBar(const ProgressBar&) = delete;
    ProgressBar& operator=(const ProgressBar&) = delete;

private:
    FILE* mOut;
    int mTotal;
    bool mEnabled;
    size_t mLastLength = 0;
};

}  // namespace kivcli

#endif
