/* The yardstick: the least a CGI process can do, in C (start, print one reply, exit). */
#include <stdio.h>

int main(void) {
    fputs("Content-Type: text/plain; charset=\"UTF-8\"\r\n\r\n{\"success\":true}\n", stdout);
    return 1;
}
