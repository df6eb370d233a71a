// SPDX-License-Identifier: MIT
//
// What starting a C program costs, whatever it does then.
int main(void)
{
    return 0;
}
