import { afterEach, beforeEach, describe, expect, it, vi } from 'vitest';
import { call, loadSession, logIn, logOut } from './client';
import { connection, connectionWorks } from './connection';
import { ApiError } from './error';
import { session, sessionClosed, sessionStarted } from './session';

const info = { csrf: 'token-1', user: 'admin', idle_seconds: 900, expires: 2_000_000_000 };

function reply(data: unknown): Response {
  return new Response(JSON.stringify({ success: true, data }), { status: 200 });
}

function refusal(
  code: number,
  status: number,
  headers: Record<string, string> = {},
  errors?: unknown,
): Response {
  return new Response(JSON.stringify({ success: false, error: { code, errors } }), { status, headers });
}

const fetched = vi.fn<(path: string, init: RequestInit) => Promise<Response>>();

function sent(index = 0): { path: string; headers: Record<string, string>; body: unknown } {
  const [path, init] = fetched.mock.calls[index] ?? [];
  return {
    path: path ?? '',
    headers: init?.headers as Record<string, string>,
    body: init?.body === undefined ? undefined : JSON.parse(init.body as string),
  };
}

beforeEach(() => {
  fetched.mockReset();
  vi.stubGlobal('fetch', fetched);
  sessionStarted(info);
});

afterEach(() => {
  vi.useRealTimers();
  vi.unstubAllGlobals();
  connectionWorks();
  sessionClosed();
});

describe('a call', () => {
  it('goes to its path with the token, and gives the data', async () => {
    fetched.mockResolvedValue(reply({ total: 0 }));
    await expect(call('directory.users', { domain: 'LAB', limit: 5 })).resolves.toEqual({ total: 0 });
    const { path, headers, body } = sent();
    expect(path).toBe('/webapi/VORN.Appliance.Directory/1/users');
    expect(headers['X-CSRF-Token']).toBe('token-1');
    expect(headers['Content-Type']).toBe('application/json');
    expect(headers).not.toHaveProperty('X-Background');
    expect(body).toEqual({ domain: 'LAB', limit: 5 });
  });

  it('asks for version 2 of the list of domains', async () => {
    fetched.mockResolvedValue(reply({ domain_list: [] }));
    await call('domain.list', {});
    expect(sent().path).toBe('/webapi/VORN.Core.Directory.Domain/2/get_domain_list');
  });

  it('of the page itself is marked so', async () => {
    fetched.mockResolvedValue(reply(null));
    await call('directory.join_steps', {}, { background: true });
    expect(sent().headers['X-Background']).toBe('1');
  });

  it('that is refused fails with the code and what the server said', async () => {
    fetched.mockResolvedValue(refusal(2607, 200, {}, { line: 'x' }));
    const error = await call('domain.test_dc', {}).catch((caught: unknown) => caught);
    expect(error).toBeInstanceOf(ApiError);
    expect(error).toMatchObject({ kind: 'answer', code: 2607, details: '{"line":"x"}', lost: false });
    expect(connection.get().state).toBe('ok');
  });

  it('without an answer is told apart from a refusal', async () => {
    fetched.mockRejectedValue(new TypeError('failed to fetch'));
    await expect(call('domain.get', {})).rejects.toMatchObject({ kind: 'network', lost: true });
    expect(connection.get().state).toBe('lost');
  });

  it('that the door can hand to nobody counts as lost', async () => {
    fetched.mockResolvedValue(refusal(250, 503));
    await expect(call('domain.get', {})).rejects.toMatchObject({ code: 250, lost: true });
    expect(connection.get().state).toBe('lost');
  });

  it('that gets something else than an answer fails as damaged', async () => {
    fetched.mockResolvedValue(new Response('<html>', { status: 502 }));
    await expect(call('domain.get', {})).rejects.toMatchObject({ kind: 'damaged', status: 502 });
    fetched.mockResolvedValue(new Response('{"data": 1}', { status: 200 }));
    await expect(call('domain.get', {})).rejects.toMatchObject({ kind: 'damaged' });
  });

  function hang(): void {
    fetched.mockImplementation(
      (_path, init) =>
        new Promise((_resolve, reject) => {
          init.signal?.addEventListener('abort', () => reject(new DOMException('stop', 'AbortError')));
        }),
    );
  }

  it.each([
    ['domain.get', {}, 60_000],
    ['domain.set', { enable_domain: false }, 330_000],
    ['directory.leave', { delete_account: false }, 330_000],
  ] as const)('%s is given up after its deadline', async (method, parameters, deadline) => {
    vi.useFakeTimers();
    hang();
    let error: unknown;
    call(method, parameters).catch((caught: unknown) => (error = caught));
    await vi.advanceTimersByTimeAsync(deadline - 1);
    expect(error).toBeUndefined();
    await vi.advanceTimersByTimeAsync(1);
    expect(error).toMatchObject({ kind: 'timeout' });
    expect(connection.get().state).toBe('ok');
  });

  it('that the page gives up is no failure of the connection', async () => {
    hang();
    const stop = new AbortController();
    const result = call('domain.get', {}, { signal: stop.signal }).catch((caught: unknown) => caught);
    stop.abort();
    expect(await result).toMatchObject({ name: 'AbortError' });
    expect(connection.get().state).toBe('ok');
  });
});

describe('the session', () => {
  it('ends with code 220', async () => {
    fetched.mockResolvedValue(refusal(220, 401));
    await expect(call('domain.get', {})).rejects.toMatchObject({ code: 220 });
    expect(session.get()).toEqual({ state: 'none', ended: true });
  });

  it('with a new token, from another window, is picked up once and the call repeated', async () => {
    fetched
      .mockResolvedValueOnce(refusal(221, 403))
      .mockResolvedValueOnce(reply({ ...info, csrf: 'token-2' }))
      .mockResolvedValueOnce(reply({ test_join_success: true }));
    await expect(call('domain.test_dc', {})).resolves.toEqual({ test_join_success: true });
    expect(sent(2).headers['X-CSRF-Token']).toBe('token-2');
    expect(fetched).toHaveBeenCalledTimes(3);
  });

  it('whose token is the same does not make the call repeat', async () => {
    fetched.mockResolvedValueOnce(refusal(221, 403)).mockResolvedValueOnce(reply(info));
    await expect(call('domain.test_dc', {})).rejects.toMatchObject({ code: 221 });
    expect(fetched).toHaveBeenCalledTimes(2);
  });

  it('begins with a log-in and ends with a log-out', async () => {
    sessionClosed();
    fetched.mockResolvedValueOnce(reply(info));
    await logIn('admin', 'secret');
    expect(sent()).toMatchObject({ path: '/session/login', body: { user: 'admin', password: 'secret' } });
    expect(sent().headers).not.toHaveProperty('X-CSRF-Token');
    expect(session.get()).toEqual({ state: 'active', info });
    fetched.mockResolvedValueOnce(reply(null));
    await logOut();
    expect(sent(1).path).toBe('/session/logout');
    expect(session.get()).toEqual({ state: 'none', ended: false });
  });

  it('log-in that is throttled says how long to wait', async () => {
    fetched.mockResolvedValue(refusal(223, 429, { 'Retry-After': '60' }));
    await expect(logIn('admin', 'x')).rejects.toMatchObject({ code: 223, retryAfter: 60 });
  });

  it('that there is none is no error at the start', async () => {
    sessionClosed();
    fetched.mockResolvedValue(refusal(220, 401));
    await loadSession();
    expect(session.get()).toEqual({ state: 'none', ended: false });
  });
});

describe('the lost connection', () => {
  it('is tried again by itself, with longer pauses, until it is back', async () => {
    vi.useFakeTimers();
    fetched.mockRejectedValue(new TypeError('failed to fetch'));
    await call('domain.get', {}).catch(() => undefined);
    expect(fetched).toHaveBeenCalledTimes(1);
    await vi.advanceTimersByTimeAsync(2000);
    expect(fetched).toHaveBeenCalledTimes(2);
    await vi.advanceTimersByTimeAsync(3900);
    expect(fetched).toHaveBeenCalledTimes(2);
    fetched.mockResolvedValue(reply(info));
    await vi.advanceTimersByTimeAsync(200);
    expect(fetched).toHaveBeenCalledTimes(3);
    expect(sent(2).path).toBe('/session');
    expect(connection.get()).toEqual({ state: 'ok', restored: true });
    await vi.advanceTimersByTimeAsync(120_000);
    expect(fetched).toHaveBeenCalledTimes(3);
  });

  it('that comes back without the session leads to the log-in', async () => {
    vi.useFakeTimers();
    fetched.mockRejectedValueOnce(new TypeError('failed to fetch')).mockResolvedValue(refusal(220, 401));
    await call('domain.get', {}).catch(() => undefined);
    await vi.advanceTimersByTimeAsync(2000);
    expect(connection.get().state).toBe('ok');
    expect(session.get()).toEqual({ state: 'none', ended: true });
  });
});
