/* The baseline of the CGI benchmarks: the least a CGI process can do. */
#include <stdio.h>

int main(void) {
    fputs("Content-Type: text/plain\r\n\r\n[]\n", stdout);
    return 0;
}
