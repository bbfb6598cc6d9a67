// answer: the appliance said no, with a code. network: nothing came. timeout: the deadline passed. damaged: what came
// is no answer of the appliance.
export type FailureKind = 'answer' | 'network' | 'timeout' | 'damaged';

// Codes of the catalogue that the page acts on by itself.
export const codes = {
  noSession: 220,
  wrongCsrf: 221,
  wrongCredentials: 222,
  tooManyAttempts: 223,
  linkUsed: 224,
  loginImpossible: 225,
  serverEnding: 241,
  serverSilent: 250,
  domainNameInvalid: 2601,
  notAMember: 2624,
  refreshRunning: 2626,
} as const;

export class ApiError extends Error {
  readonly kind: FailureKind;
  // The catalogue's code; 0 unless `kind` is "answer".
  readonly code: number;
  readonly status: number;
  // What the server said besides, or null.
  readonly details: string | null;
  // Seconds to wait before the next try, or null.
  readonly retryAfter: number | null;

  constructor(
    kind: FailureKind,
    { code = 0, status = 0, details = null as string | null, retryAfter = null as number | null } = {},
  ) {
    super(kind === 'answer' ? `code ${code}` : kind);
    this.name = 'ApiError';
    this.kind = kind;
    this.code = code;
    this.status = status;
    this.details = details;
    this.retryAfter = retryAfter;
  }

  // Was there no answer because the appliance, or the way to it, is not there at present?
  get lost(): boolean {
    return this.kind === 'network' || this.code === codes.serverSilent;
  }
}

// A call that was given up by the page itself, as when its view was left.
export function isAbort(error: unknown): boolean {
  return error instanceof DOMException && error.name === 'AbortError';
}
