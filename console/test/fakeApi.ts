import { vi } from 'vitest';
import { methods } from '../src/api/methods';
import type { MethodName } from '../src/api/types';

export class Refusal {
  constructor(
    readonly code: number,
    readonly status = 200,
    readonly headers: Record<string, string> = {},
  ) {}
}

export interface Sent {
  name: string;
  parameters: Record<string, unknown>;
  background: boolean;
}

type Answer = (parameters: Record<string, unknown>) => unknown;

// In place of fetch(): answers what a test says by a method's name, or by a path such as "/session/login". An answer
// that is a Refusal is one; one that throws cuts the connection.
export class FakeApi {
  readonly sent: Sent[] = [];
  readonly #answers = new Map<string, Answer>();

  install(): void {
    vi.stubGlobal('fetch', (path: string, init: RequestInit) => this.#serve(path, init));
  }

  on(name: MethodName | `/session${string}`, answer: Answer): void {
    this.#answers.set(name, answer);
  }

  of(name: string): Sent[] {
    return this.sent.filter((call) => call.name === name);
  }

  async #serve(path: string, init: RequestInit): Promise<Response> {
    const found = (Object.keys(methods) as MethodName[]).find((method) => methods[method].path === path);
    const name = found ?? path;
    const parameters =
      init.body === undefined ? {} : (JSON.parse(init.body as string) as Record<string, unknown>);
    const background = 'X-Background' in (init.headers as Record<string, string>);
    this.sent.push({ name, parameters, background });
    const answer = this.#answers.get(name);
    if (answer === undefined) throw new Error(`nobody answers ${name}`);
    const gone = new Promise<never>((_resolve, reject) => {
      init.signal?.addEventListener('abort', () => reject(new DOMException('stop', 'AbortError')));
    });
    const data = await Promise.race([Promise.resolve(answer(parameters)), gone]);
    if (data instanceof Refusal) {
      return new Response(JSON.stringify({ success: false, error: { code: data.code } }), {
        status: data.status,
        headers: data.headers,
      });
    }
    return new Response(JSON.stringify({ success: true, data: data ?? null }));
  }
}

// A promise that a test settles.
export function later<T>(): {
  promise: Promise<T>;
  resolve: (value: T) => void;
  reject: (error: unknown) => void;
} {
  let resolve!: (value: T) => void;
  let reject!: (error: unknown) => void;
  const promise = new Promise<T>((yes, no) => {
    resolve = yes;
    reject = no;
  });
  return { promise, resolve, reject };
}
