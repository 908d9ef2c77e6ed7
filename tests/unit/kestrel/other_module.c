/* SPDX-License-Identifier: Apache-2.0 */
/* A shared library that is not a module of this version. */
int kestrelModuleOpen0(void);

int kestrelModuleOpen0(void) {
  return 0;
}
