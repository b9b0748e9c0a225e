/* The baseline of the benchmark: the least a CGI process can do, print a fixed reply. */
#include <stdio.h>

int main(void) {
    fputs("Content-Type: text/plain; charset=\"UTF-8\"\r\n\r\n{\"success\":true}\n", stdout);
    return 1;
}
