// What is wrong with a file, for people.
import {
  ChangedError,
  FormatError,
  HttpError,
  LimitError,
  PyramidError,
  RangesError,
  SourceError,
} from "../../src/errors.js";

export interface Message {
  title: string;
  detail: string;
  advice: string;
}

function titleOf(error: unknown): [title: string, advice: string] {
  if (error instanceof ChangedError)
    return ["The file has changed", "It was replaced while it was shown. Opening it again shows what is there now."];
  if (error instanceof LimitError) return ["The file claims too much", "It is likely to be damaged."];
  if (error instanceof FormatError)
    return ["The file cannot be read", "It is another kind of file, or it is damaged, or it is still being written."];
  if (error instanceof HttpError)
    return error.status === 404
      ? ["There is no such file", "Its name may be misspelt, or it was moved."]
      : ["The server refuses the file", "The server may say more to those who run it."];
  if (error instanceof RangesError)
    return [
      "The server cannot give parts of the file",
      "It has to answer requests for ranges, and to show that it does.",
    ];
  if (error instanceof SourceError)
    return ["The file cannot be reached", "The network may be down, or the server allows no pages of other origins."];
  if (error instanceof PyramidError || error instanceof RangeError) return ["The file cannot be shown", ""];
  return ["Something went wrong", ""];
}

export function messageOf(error: unknown): Message {
  const [title, advice] = titleOf(error);
  const detail = error instanceof Error ? error.message : String(error);
  return { title, detail: detail.length > 600 ? `${detail.slice(0, 600)}…` : detail, advice };
}
