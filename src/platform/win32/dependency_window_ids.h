/* The module dependency dialog's resource ids, shared by its template, its
   dialog procedure and the test hosts that read the window from outside.
   Plain defines, as the resource compiler reads this file too. */
#ifndef KPX_DEPENDENCY_WINDOW_IDS_H
#define KPX_DEPENDENCY_WINDOW_IDS_H

#define KPX_DEPENDENCY_DIALOG 220

/* OK and Cancel are IDOK and IDCANCEL. */
#define KPX_DEPENDENCY_LABEL 2201
#define KPX_DEPENDENCY_TEXT 2202

#endif
