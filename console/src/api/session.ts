import { Store } from './store';
import type { SessionInfo } from './types';

export type SessionState =
  // Not asked yet.
  | { state: 'unknown' }
  // `ended`: there was one in this window, and it is over.
  | { state: 'none'; ended: boolean }
  | { state: 'active'; info: SessionInfo };

export const session = new Store<SessionState>({ state: 'unknown' });

export function sessionStarted(info: SessionInfo): void {
  session.set({ state: 'active', info });
}

export function sessionEnded(): void {
  const now = session.get();
  // Of several calls that were on their way each tells it.
  session.set({ state: 'none', ended: now.state === 'active' || (now.state === 'none' && now.ended) });
}

export function sessionClosed(): void {
  session.set({ state: 'none', ended: false });
}

export function csrfToken(): string | null {
  const now = session.get();
  return now.state === 'active' ? now.info.csrf : null;
}
