// A PNG of the whole Xvfb screen, so a person can look at what a test showed (the dialogs
// above all). Tests do not compare it with anything.
#pragma once

namespace testkit {

// Writes $TESSEL_BUILD/screenshots/<name>.png with imagemagick's `import`, started as a
// Unix program (Wine runs those directly), and returns once the file is there, so whatever
// is on screen may go away afterwards. Without DISPLAY or TESSEL_BUILD it does nothing; a
// capture that fails is reported on stdout and never fails a test.
void saveScreenshot(const char* name);

}  // namespace testkit
