// SPDX-License-Identifier: Apache-2.0
//
// Does nothing: its target compiles the headers that all test programs share.
int main() { return 0; }
