// The pages of --report as templates. The build generates them from the sources in cli/report/.
#ifndef TAVO_CLI_REPORT_REPORT_PAGES_H
#define TAVO_CLI_REPORT_REPORT_PAGES_H

extern const char kSongPage[];   // keys: @DATA@ JSON, @TITLE@
extern const char kIndexPage[];  // key: @ROWS@

#endif
