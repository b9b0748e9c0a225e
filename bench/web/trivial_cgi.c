/* The baseline: the smallest CGI that answers like audiotree.cgi's "avoid_timeout". */
#include <stdio.h>

int main(void) {
    fputs("Content-Type: text/plain; charset=\"UTF-8\"\r\n\r\n{\"success\":true}\n", stdout);
    return 0;
}
