// Makes an allocation fail, of the library's as of the test's own.
#pragma once

extern int failingNew;  // the one from now on that fails, counted from 1; 0: none
