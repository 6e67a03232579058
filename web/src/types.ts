// The twelve types of samples, in one list.

/** The name of a type of samples, as it stands in the file. */
export type PixelType =
  | "Byte"
  | "Char"
  | "UInt16"
  | "Int16"
  | "UInt32"
  | "Int32"
  | "UInt64"
  | "Int64"
  | "Single"
  | "Double"
  | "ComplexSingle"
  | "ComplexDouble";

/** The array that holds samples of each type. Those of the complex types have two numbers a sample: real, imaginary. */
export interface SampleArrays {
  Byte: Uint8Array;
  Char: Int8Array;
  UInt16: Uint16Array;
  Int16: Int16Array;
  UInt32: Uint32Array;
  Int32: Int32Array;
  UInt64: BigUint64Array;
  Int64: BigInt64Array;
  Single: Float32Array;
  Double: Float64Array;
  ComplexSingle: Float32Array;
  ComplexDouble: Float64Array;
}

/** An array of samples of any type. */
export type SampleArray = SampleArrays[PixelType];

/** A value of a pixel in a record: a `bigint` for `UInt64` and `Int64`; of complex types the real part. */
export type PixelValue = number | bigint;

export interface TypeInfo {
  bytes: number; // of a sample
  array: new (buffer: ArrayBuffer) => SampleArray;
}

export const TYPES: Readonly<Record<PixelType, TypeInfo>> = {
  Byte: { bytes: 1, array: Uint8Array },
  Char: { bytes: 1, array: Int8Array },
  UInt16: { bytes: 2, array: Uint16Array },
  Int16: { bytes: 2, array: Int16Array },
  UInt32: { bytes: 4, array: Uint32Array },
  Int32: { bytes: 4, array: Int32Array },
  UInt64: { bytes: 8, array: BigUint64Array },
  Int64: { bytes: 8, array: BigInt64Array },
  Single: { bytes: 4, array: Float32Array },
  Double: { bytes: 8, array: Float64Array },
  ComplexSingle: { bytes: 8, array: Float32Array },
  ComplexDouble: { bytes: 16, array: Float64Array },
};
