import { ActionGroup, Form } from '@patternfly/react-core/dist/esm/components/Form';
import { Alert } from '@patternfly/react-core/dist/esm/components/Alert';
import { Button } from '@patternfly/react-core/dist/esm/components/Button';
import { useEffect, useState } from 'react';
import { logIn } from '../api/client';
import { ApiError } from '../api/error';
import { t } from '../texts';
import { ErrorAlert, TextField, useCall, useNow } from '../ui';

interface LoginFormProps {
  // A session of this window has ended.
  ended: boolean;
  // Why a one-time link did not log in.
  linkError?: unknown;
}

// Name and password. After too many attempts the button waits until the next one is allowed.
export function LoginForm({ ended, linkError }: LoginFormProps) {
  const [user, setUser] = useState('');
  const [password, setPassword] = useState('');
  const [insist, setInsist] = useState(false);
  // When the next attempt is allowed, in milliseconds since 1970; null: at once.
  const [allowed, setAllowed] = useState<number | null>(null);
  const act = useCall(logIn);
  const now = useNow(250, allowed !== null);
  const wait = allowed === null ? 0 : Math.max(0, Math.ceil((allowed - now) / 1000));

  const { error } = act;
  useEffect(() => {
    if (!(error instanceof ApiError)) return;
    if (error.retryAfter !== null) setAllowed(Date.now() + error.retryAfter * 1000);
    document.getElementById('login-password')?.focus();
  }, [error]);

  const problems = {
    user: user.trim() === '' ? t('login.needUser') : null,
    password: password === '' ? t('login.needPassword') : null,
  };
  const submit = () => {
    if (wait > 0) return;
    setInsist(true);
    const wrong =
      problems.user !== null ? 'login-user' : problems.password !== null ? 'login-password' : null;
    if (wrong !== null) {
      document.getElementById(wrong)?.focus();
      return;
    }
    setAllowed(null);
    setInsist(false);
    setPassword('');
    void act.run(user.trim(), password);
  };

  return (
    <Form
      noValidate
      onSubmit={(event) => {
        event.preventDefault();
        submit();
      }}
    >
      {error === undefined && linkError !== undefined && (
        <ErrorAlert error={linkError} title={t('login.link.failed')} />
      )}
      {error === undefined && linkError === undefined && ended && (
        <div role="status">
          <Alert isInline variant="info" component="p" title={t('login.ended')} />
        </div>
      )}
      {error !== undefined && <ErrorAlert error={error} />}
      {allowed !== null && (
        <p role="timer" aria-live="off">
          {wait > 0 ? t('login.wait', { count: wait }) : t('login.waitOver')}
        </p>
      )}
      <TextField
        id="login-user"
        label={t('login.user')}
        value={user}
        onChange={setUser}
        problem={problems.user}
        insist={insist}
        autoComplete="username"
        initialFocus
      />
      <TextField
        id="login-password"
        label={t('login.password')}
        password
        value={password}
        onChange={setPassword}
        problem={problems.password}
        insist={insist}
        autoComplete="current-password"
      />
      <ActionGroup>
        <Button
          type="submit"
          variant="primary"
          isBlock
          isLoading={act.busy}
          isDisabled={act.busy || wait > 0}
        >
          {t(act.busy ? 'login.running' : 'login.submit')}
        </Button>
      </ActionGroup>
    </Form>
  );
}
