#include "mxml_whitespace.h"

/* Debian's Mini-XML has no such switch: see the header for what that means. */
void mxmlSetLoneWhitespaceOff(int /* off */)
{
}
