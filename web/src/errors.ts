// What can go wrong, as classes: whoever shows a pyramid has to tell a file that is none from a server that
// is not there. Each message is one line, for people.

/** The root of all errors of this package, but for an abort and a `RangeError`, which is the caller's. */
export class PyramidError extends Error {
  override name = "PyramidError"; // told in each class: names of classes do not outlive the bundling

  constructor(message: string, options?: { cause?: unknown }) {
    super(message);
    if (options && "cause" in options) (this as { cause?: unknown }).cause = options.cause;
  }
}

/** The bytes are no pyramid file, or its header is damaged or was never finished. Asking again does not help. */
export class FormatError extends PyramidError {
  override name = "FormatError";
}

/** The file claims more than this reader takes on; the message names the limit. */
export class LimitError extends PyramidError {
  override name = "LimitError";
}

/** The file is not the one that was opened any more. Nothing is read of it afterwards: open it again. */
export class ChangedError extends PyramidError {
  override name = "ChangedError";
}

/** The bytes could not be had: the network failed, the answer was short or makes no sense. */
export class SourceError extends PyramidError {
  override name = "SourceError";
}

/** The server answered with a status that says no: 404, 403, 500 and the like. */
export class HttpError extends SourceError {
  override name = "HttpError";

  /** @param status The status of the answer, from 100 to 599. */
  constructor(
    message: string,
    readonly status: number,
  ) {
    super(message);
  }
}

/** The server gives no ranges (or does not show a page of another origin that it does), and the file is large. */
export class RangesError extends SourceError {
  override name = "RangesError";
}
