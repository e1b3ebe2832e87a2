/* The Restore dialog's resource ids, shared by its template, its dialog
   procedure and the test hosts that read the window from outside. Plain
   defines, as the resource compiler reads this file too. */
#ifndef KPX_RESTORE_WINDOW_IDS_H
#define KPX_RESTORE_WINDOW_IDS_H

#define KPX_RESTORE_DIALOG 210

/* OK, Cancel and Help are IDOK, IDCANCEL and IDHELP. */
#define KPX_RESTORE_TITLE 2101
#define KPX_RESTORE_SUBTITLE 2102
#define KPX_RESTORE_INSTRUCTIONS 2103
#define KPX_RESTORE_LIST 2104

/* The file row's context menu: its one command. */
#define KPX_RESTORE_COMPARE 2110
/* The one-second timer a click on a project row may start. */
#define KPX_RESTORE_TIMER 1

#endif
