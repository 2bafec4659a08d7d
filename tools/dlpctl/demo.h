#pragma once

// Replays the built-in example in a scratch directory under /tmp, inside dlp-sandbox: outside
// it, the program runs itself again through dlp-sandbox unless `useSystemPaths`. Exit status as
// replay's; 2 when no dlp-sandbox is found.
int runDemo(bool showLog, bool useSystemPaths);
