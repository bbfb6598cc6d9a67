import catalogue from '@catalogue/error-codes.json';
import { ApiError } from '../api/error';
import { t } from '../texts';

// What an error means, its likely cause, and what to try. `code` is null when the error has none.
export interface Explanation {
  code: number | null;
  meaning: string;
  cause: string;
  action: string;
}

interface Entry {
  code: number;
  meaning: string;
  cause: string;
  action: string;
}

const byCode = new Map<number, Entry>(catalogue.codes.map((entry) => [entry.code, entry]));

export function explainCode(code: number): Explanation {
  const entry = byCode.get(code);
  if (entry !== undefined) {
    return { code, meaning: entry.meaning, cause: entry.cause, action: entry.action };
  }
  return {
    code,
    meaning: t('error.unknown'),
    cause: t('error.unknown.cause'),
    action: t('error.unknown.action'),
  };
}

export function explain(error: unknown): Explanation {
  if (!(error instanceof ApiError)) return texts('error.page');
  switch (error.kind) {
    case 'answer':
      return explainCode(error.code);
    case 'network':
      return texts('error.network');
    case 'timeout':
      return texts('error.timeout');
    case 'damaged':
      return texts('error.damaged');
  }
}

function texts(key: 'error.page' | 'error.network' | 'error.timeout' | 'error.damaged'): Explanation {
  return { code: null, meaning: t(key), cause: t(`${key}.cause`), action: t(`${key}.action`) };
}
