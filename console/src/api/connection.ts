import { Store } from './store';

// Is the appliance there? `nextTry` is when it is asked again, in milliseconds since 1970; null: it is being asked.
export type ConnectionState =
  { state: 'ok'; restored: boolean } | { state: 'lost'; nextTry: number | null; attempts: number };

const kFirstPause = 2_000;
const kLongestPause = 30_000;

export const connection = new Store<ConnectionState>({ state: 'ok', restored: false });

let timer: ReturnType<typeof setTimeout> | null = null;
let ask: (() => Promise<boolean>) | null = null;

// How to find out whether the appliance answers again; set once by the client.
export function setProbe(probe: () => Promise<boolean>): void {
  ask = probe;
}

export function connectionWorks(): void {
  if (connection.get().state === 'ok') return;
  if (timer !== null) clearTimeout(timer);
  timer = null;
  connection.set({ state: 'ok', restored: true });
}

export function connectionLost(): void {
  if (connection.get().state === 'lost') return;
  plan(0);
}

export function dismissRestored(): void {
  if (connection.get().state === 'ok') connection.set({ state: 'ok', restored: false });
}

export function retryNow(): void {
  const now = connection.get();
  if (now.state === 'lost' && now.nextTry !== null) void attempt(now.attempts);
}

function plan(attempts: number): void {
  const pause = Math.min(kFirstPause * 2 ** attempts, kLongestPause);
  connection.set({ state: 'lost', nextTry: Date.now() + pause, attempts });
  timer = setTimeout(() => void attempt(attempts), pause);
}

async function attempt(attempts: number): Promise<void> {
  if (timer !== null) clearTimeout(timer);
  timer = null;
  connection.set({ state: 'lost', nextTry: null, attempts });
  const works = ask !== null && (await ask());
  if (works) connectionWorks();
  else if (connection.get().state === 'lost') plan(attempts + 1);
}
