import { connectionLost, connectionWorks, setProbe } from './connection';
import { ApiError, codes } from './error';
import { methods } from './methods';
import { csrfToken, session, sessionClosed, sessionEnded, sessionStarted } from './session';
import type { MethodName, Methods, SessionInfo } from './types';

export interface CallOptions {
  signal?: AbortSignal;
  // True for a call that the page makes by itself: it does not keep the session alive.
  background?: boolean;
}

const kSessionDeadline = 30_000;
const kProbeDeadline = 10_000;

interface Request extends CallOptions {
  verb: 'GET' | 'POST';
  path: string;
  body?: unknown;
  deadline: number;
}

interface Reply {
  success: boolean;
  data: unknown;
  code: number;
  errors: unknown;
  status: number;
  retryAfter: number | null;
}

// One request to the appliance. Throws ApiError, or the abort of `signal`.
async function send(request: Request): Promise<Reply> {
  const headers: Record<string, string> = { Accept: 'application/json' };
  const token = csrfToken();
  if (request.verb === 'POST') {
    headers['Content-Type'] = 'application/json';
    if (token !== null) headers['X-CSRF-Token'] = token;
  }
  if (request.background) headers['X-Background'] = '1';

  // Not AbortSignal.any: browsers of two years ago don't know it.
  const stop = new AbortController();
  let late = false;
  const timer = setTimeout(() => {
    late = true;
    stop.abort();
  }, request.deadline);
  const forward = () => stop.abort();
  if (request.signal?.aborted) stop.abort();
  request.signal?.addEventListener('abort', forward);
  try {
    const response = await fetch(request.path, {
      method: request.verb,
      headers,
      credentials: 'same-origin',
      cache: 'no-store',
      redirect: 'error',
      signal: stop.signal,
      ...(request.verb === 'POST' ? { body: JSON.stringify(request.body ?? {}) } : {}),
    });
    return readReply(response, await response.text());
  } catch (error) {
    if (error instanceof ApiError) throw error;
    if (request.signal?.aborted) throw new DOMException('given up', 'AbortError');
    throw new ApiError(late ? 'timeout' : 'network');
  } finally {
    clearTimeout(timer);
    request.signal?.removeEventListener('abort', forward);
  }
}

function readReply(response: Response, text: string): Reply {
  let body: unknown;
  try {
    body = JSON.parse(text);
  } catch {
    throw new ApiError('damaged', { status: response.status });
  }
  if (typeof body !== 'object' || body === null || !('success' in body)) {
    throw new ApiError('damaged', { status: response.status });
  }
  const { success, data, error } = body as {
    success: unknown;
    data?: unknown;
    error?: { code?: unknown; errors?: unknown };
  };
  const wait = Number(response.headers.get('Retry-After') ?? NaN);
  return {
    success: success === true,
    data: data ?? null,
    code: typeof error?.code === 'number' ? error.code : 0,
    errors: error?.errors ?? null,
    status: response.status,
    retryAfter: Number.isFinite(wait) && wait >= 0 ? wait : null,
  };
}

function failureOf(reply: Reply): ApiError {
  const { errors } = reply;
  const details = errors === null ? null : typeof errors === 'string' ? errors : JSON.stringify(errors);
  return new ApiError('answer', {
    code: reply.code,
    status: reply.status,
    details,
    retryAfter: reply.retryAfter,
  });
}

// Sends and keeps the states of the connection and of the session true to what came of it.
async function exchange(request: Request): Promise<unknown> {
  let reply: Reply;
  try {
    reply = await send(request);
    if (reply.code === codes.wrongCsrf && (await renewToken(request))) reply = await send(request);
  } catch (error) {
    if (error instanceof ApiError && error.lost) connectionLost();
    throw error;
  }
  if (reply.success) {
    connectionWorks();
    return reply.data;
  }
  const failure = failureOf(reply);
  if (failure.lost) connectionLost();
  else connectionWorks();
  if (reply.code === codes.noSession) sessionEnded();
  throw failure;
}

// Another window of the same browser may have logged in anew: the session's own token is asked for once.
async function renewToken(request: Request): Promise<boolean> {
  const before = csrfToken();
  const reply = await send({
    verb: 'GET',
    path: '/session',
    deadline: kSessionDeadline,
    ...signalOf(request),
  });
  if (!reply.success) return false;
  sessionStarted(reply.data as SessionInfo);
  return csrfToken() !== before;
}

function signalOf({ signal, background }: CallOptions): CallOptions {
  return { ...(signal ? { signal } : {}), ...(background ? { background } : {}) };
}

// Calls a method of the web API. Throws ApiError; when `signal` is aborted, a DOMException "AbortError".
export async function call<M extends MethodName>(
  method: M,
  parameters: Methods[M]['parameters'],
  options: CallOptions = {},
): Promise<Methods[M]['data']> {
  const { path, deadline } = methods[method];
  return (await exchange({
    verb: 'POST',
    path,
    body: parameters,
    deadline,
    ...signalOf(options),
  })) as Methods[M]['data'];
}

// Asks whose session this is. Sets the session's state; throws ApiError only when there is no answer.
export async function loadSession(options: CallOptions = {}): Promise<void> {
  try {
    const data = await exchange({
      verb: 'GET',
      path: '/session',
      deadline: kSessionDeadline,
      ...signalOf(options),
    });
    sessionStarted(data as SessionInfo);
  } catch (error) {
    if (!(error instanceof ApiError) || error.code !== codes.noSession) throw error;
  }
}

export async function logIn(user: string, password: string): Promise<void> {
  const body = { user, password };
  sessionStarted(
    (await exchange({
      verb: 'POST',
      path: '/session/login',
      body,
      deadline: kSessionDeadline,
    })) as SessionInfo,
  );
}

export async function logInByLink(token: string): Promise<void> {
  const body = { token };
  sessionStarted(
    (await exchange({
      verb: 'POST',
      path: '/session/link',
      body,
      deadline: kSessionDeadline,
    })) as SessionInfo,
  );
}

export async function logOut(): Promise<void> {
  try {
    await exchange({ verb: 'POST', path: '/session/logout', body: {}, deadline: kSessionDeadline });
  } catch (error) {
    if (!(error instanceof ApiError) || error.code !== codes.noSession) throw error;
  }
  sessionClosed();
}

setProbe(async () => {
  try {
    const path = '/session';
    const reply = await send({ verb: 'GET', path, deadline: kProbeDeadline, background: true });
    if (reply.success) sessionStarted(reply.data as SessionInfo);
    else if (reply.code === codes.noSession) {
      if (session.get().state === 'active') sessionEnded();
    } else if (reply.status >= 500) return false;
    return true;
  } catch {
    return false;
  }
});
