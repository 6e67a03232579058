// A program of no tests, whose precompiled headers all test programs share.
