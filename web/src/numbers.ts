// Numbers as the documents of a pyramid file spell them: what stands at the beginning of a text counts,
// what follows is ignored, and a text without a number is 0.

const WHOLE = /^[ \t\n\v\f\r]*([+-]?)(\d*)/;
const REAL =
  /^[ \t\n\v\f\r]*([+-]?)(?:0[xX]((?:[\da-fA-F]+\.?[\da-fA-F]*|\.[\da-fA-F]+))(?:[pP]([+-]?\d+))?|(inf)(?:inity)?|(nan)|((?:\d+\.?\d*|\.\d+)(?:[eE][+-]?\d+)?))/i;
const INT64_MAX = (1n << 63n) - 1n;

/** The lowest 32 bits of a decimal that ends at the numbers of 64 bits: from 0 to 2^32 - 1. */
export function readInteger(text: string): number {
  const [, sign, digits] = WHOLE.exec(text) as unknown as [string, string, string];
  const short = digits.replace(/^0+/, "");
  const exact = short.length > 19 ? INT64_MAX + 1n : BigInt(short || 0);
  const negative = sign === "-";
  const value = exact > INT64_MAX ? (negative ? -INT64_MAX - 1n : INT64_MAX) : negative ? -exact : exact;
  return Number(BigInt.asUintN(32, value));
}

// Of digits beyond the 53 bits of a double whether there are any matters, for the rounding.
function readHexadecimal(digits: string, exponent: string | undefined): number {
  const [whole, fraction = ""] = digits.split(".") as [string, string?];
  let all = (whole + fraction).replace(/^0+/, "");
  let power = Number(exponent ?? 0) - 4 * fraction.length;
  if (all.length > 16) {
    power += 4 * (all.length - 16);
    all = all.slice(0, 16) + (/[^0]/.test(all.slice(16)) ? "1" : "0");
    power -= 4;
  }
  if (!all) return 0;
  // Two steps, since 2 to the power itself may be beyond a double where the product is not.
  const value = Number(BigInt("0x" + all));
  const half = Math.trunc(Math.max(-2200, Math.min(2200, power)) / 2);
  return value * 2 ** half * 2 ** (Math.max(-2200, Math.min(2200, power)) - half);
}

/** What `atof` reads in the locale "C": decimal or hexadecimal, `inf` and `nan` included. */
export function readReal(text: string): number {
  const match = REAL.exec(text);
  if (!match) return 0;
  const [, sign, hexadecimal, exponent, infinite, nan, decimal] = match;
  const value = hexadecimal
    ? readHexadecimal(hexadecimal, exponent)
    : infinite
      ? Infinity
      : nan
        ? NaN
        : Number(decimal);
  return sign === "-" ? -value : value;
}

/** A real cut toward zero, as 64 bits with a sign; what they do not hold is -2^63. */
export function truncate(value: number): bigint {
  return value >= -(2 ** 63) && value < 2 ** 63 ? BigInt(Math.trunc(value)) : -(1n << 63n);
}

/** The same without a sign: what lies between 2^63 and 2^64 is kept, and all else that does not fit is 2^63. */
export function truncateUnsigned(value: number): bigint {
  if (value > 2 ** 63 && value < 2 ** 64) return BigInt(value);
  return BigInt.asUintN(64, truncate(value));
}
