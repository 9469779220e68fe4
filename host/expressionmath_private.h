#pragma once

// The functions of expressions that a processor doesn't compute itself, from + - * / and sqrt alone: the C library's differ in the
// last bits from machine to machine, and what an expression says goes into render identities.
//
// Accuracy: a few units in the last place; Pow with a fractional exponent some |y log x| times that.

namespace kfshost::exprmath {

// Angles are in radians. Those beyond a million are first taken modulo the double nearest to two pi.
double Sin(double x);
double Cos(double x);
double Tan(double x);
double Asin(double x);
double Acos(double x);
double Atan2(double y, double x);
double Exp(double x);
double Log(double x);
// A whole exponent of up to 1024 multiplies; with another one, the power of a number below 0 is NaN.
double Pow(double x, double y);

// Drawn by the bits of its arguments, in [0, 1).
double Random(double seed, double time);
// A smooth line through a drawn number in [-1, 1) at each whole x.
double Noise(double x, double seed);

}  // namespace kfshost::exprmath
