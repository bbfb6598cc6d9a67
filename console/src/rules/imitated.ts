// For tests: an appliance behind fetch().

import { vi } from 'vitest';
import { methods } from '../api/methods';
import type { MethodName, Methods } from '../api/types';

export class Refusal {
  constructor(
    readonly code: number,
    readonly errors: unknown = null,
  ) {}
}

export interface Received {
  method: MethodName;
  parameters: Record<string, unknown>;
  background: boolean;
}

type Answer<M extends MethodName> = Methods[M]['data'] | Refusal;
export type Handlers = {
  [M in MethodName]?: (parameters: Methods[M]['parameters']) => Answer<M> | Promise<Answer<M>>;
};

// Answers calls by `handlers`, which may be changed while the test runs, and notes them in the order in which they
// came. A method without a handler answers that there is none.
export function imitate(handlers: Handlers) {
  const received: Received[] = [];
  const reply = (body: unknown, status = 200) =>
    new Response(JSON.stringify(body), { status, headers: { 'Content-Type': 'application/json' } });
  vi.stubGlobal('fetch', async (path: string, init: RequestInit) => {
    const method = (Object.keys(methods) as MethodName[]).find((name) => methods[name].path === path);
    const handler = method === undefined ? undefined : handlers[method];
    if (method === undefined || handler === undefined) {
      return reply({ success: false, error: { code: 211, errors: path } }, 404);
    }
    const parameters = JSON.parse(String(init.body)) as Record<string, unknown>;
    received.push({ method, parameters, background: new Headers(init.headers).has('X-Background') });
    const given = new Promise<never>((_resolve, reject) => {
      init.signal?.addEventListener('abort', () => reject(new DOMException('given up', 'AbortError')));
    });
    const answer = await Promise.race([(handler as (p: unknown) => unknown)(parameters), given]);
    return answer instanceof Refusal
      ? reply({ success: false, error: { code: answer.code, errors: answer.errors } })
      : reply({ success: true, data: answer });
  });
  const of = (method: MethodName) => received.filter((call) => call.method === method);
  return { handlers, received, of };
}

// An answer that the test gives when it wants to.
export function later<T>(): { promise: Promise<T>; give: (value: T) => void } {
  let give: (value: T) => void = () => undefined;
  const promise = new Promise<T>((resolve) => {
    give = resolve;
  });
  return { promise, give };
}

export const kMember: Methods['domain.get']['data'] = {
  enable_domain: true,
  domain_name: 'LAB',
  domain_type: 'AD',
  manage_mode: 0,
  dns: '10.0.0.1',
  advance_domain_conf: {
    enable_advance_option: false,
    kdc: '',
    netbios_name: 'LAB',
    fqdn_name: 'LAB.EXAMPLE.COM',
    register_nics: ['all'],
  },
};
