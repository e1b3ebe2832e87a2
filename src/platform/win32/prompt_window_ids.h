/* The prompt window's resource ids, shared by its template, its dialog
   procedure and the test hosts that read the window from outside. Plain
   defines, as the resource compiler reads this file too. */
#ifndef KPX_PROMPT_WINDOW_IDS_H
#define KPX_PROMPT_WINDOW_IDS_H

#define KPX_PROMPT_DIALOG 200

/* OK, Cancel and Help are IDOK, IDCANCEL and IDHELP. */
#define KPX_PROMPT_MESSAGE 2001
#define KPX_PROMPT_ICON_CRITICAL 2002
#define KPX_PROMPT_ICON_QUESTION 2003
#define KPX_PROMPT_ICON_INFORMATION 2004
#define KPX_PROMPT_DONT_SHOW 2005

#endif
