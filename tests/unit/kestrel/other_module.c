/* SPDX-License-Identifier: Apache-2.0 */
/* A shared library that is no module of this version. */
int kestrelModuleOpen0(void);

int kestrelModuleOpen0(void) {
  return 0;
}
